// SPDX-License-Identifier: Apache-2.0
#include "kova/kova_list.h"

#include "kova_mem.h"

namespace {

void release_payload(void* data, LIST_RELEASE_FN release) {
    if (release) {
        release(data);
    } else if (data) {
        kova_mem_free(data);
    }
}

// Joins the neighbours of an element node and detaches it.
void unlink(LIST* list, NODE* node) {
    if (node->prev) node->prev->next = node->next;
    if (node->next) node->next->prev = node->prev;
    node->prev = nullptr;
    node->next = nullptr;
    list->count--;
}

}  // namespace

extern "C" {

LIST* list_create(void) {
    auto* list = static_cast<LIST*>(kova_mem_malloc(sizeof(LIST)));
    auto* tail = static_cast<NODE*>(kova_mem_malloc(sizeof(NODE)));
    auto* head = static_cast<NODE*>(kova_mem_malloc(sizeof(NODE)));
    if (!list || !tail || !head) {
        kova_mem_free(list);
        kova_mem_free(tail);
        kova_mem_free(head);
        return nullptr;
    }
    *tail = NODE{nullptr, head, nullptr};
    *head = NODE{nullptr, nullptr, tail};
    *list = LIST{head, tail, 0};
    return list;
}

void list_destory(LIST* list, LIST_RELEASE_FN release) {
    if (!list) return;
    NODE* node = list->head;
    while (node) {
        NODE* next = node->next;
        release_payload(node->data, release);
        kova_mem_free(node);
        list->head = next;
        node = next;
    }
    kova_mem_free(list);
}

NODE* new_node(void* data, NODE* prev, NODE* next) {
    auto* node = static_cast<NODE*>(kova_mem_malloc(sizeof(NODE)));
    if (!node) return nullptr;
    *node = NODE{data, prev, next};
    return node;
}

NODE* insert_after(LIST* list, NODE* node, void* data) {
    if (!list || !node) return nullptr;
    if (node == list->tail) return insert_before(list, node, data);
    NODE* added = new_node(data, node, node->next);
    if (!added) return nullptr;
    if (node->next) node->next->prev = added;
    node->next = added;
    list->count++;
    return added;
}

NODE* insert_before(LIST* list, NODE* node, void* data) {
    if (!list || !node) return nullptr;
    if (node == list->head) return insert_after(list, node, data);
    NODE* added = new_node(data, node->prev, node);
    if (!added) return nullptr;
    if (node->prev) node->prev->next = added;
    node->prev = added;
    list->count++;
    return added;
}

NODE* list_pushback(LIST* list, void* data) {
    if (!list || !list->tail) return nullptr;
    return insert_before(list, list->tail, data);
}

NODE* list_getat(LIST* list, uint32_t index) {
    if (!list || index >= list->count) return nullptr;
    NODE* node = list->head;
    for (uint32_t i = 0; i <= index; ++i) node = node->next;
    return node;
}

// The same function under its second exported name. GCC infers `nothrow` for the target and
// would have the alias declared with it, which the public C declaration cannot carry.
#if defined(__GNUC__) && !defined(__clang__)
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wmissing-attributes"
#endif
NODE* list_getNode(LIST* list, uint32_t index) __attribute__((alias("list_getat")));
#if defined(__GNUC__) && !defined(__clang__)
#pragma GCC diagnostic pop
#endif

NODE* remove_node(LIST* list, NODE* node) {
    if (!list || !node) return nullptr;
    NODE* chosen = node;
    if (chosen == list->head) chosen = list->head->next;  // the first element
    if (chosen == list->tail) chosen = list->tail->prev;  // the last element
    if (chosen == list->head) return nullptr;             // empty list
    unlink(list, chosen);
    return chosen;
}

void list_removeat(LIST* list, uint32_t index, LIST_RELEASE_FN release) {
    NODE* node = list_getat(list, index);
    if (!node) return;
    unlink(list, node);
    release_payload(node->data, release);
    kova_mem_free(node);
}

NODE* del_node(NODE* node, LIST_RELEASE_FN release) {
    if (!node) return nullptr;
    NODE* next = node->next;
    release_payload(node->data, release);
    kova_mem_free(node);
    return next;
}

void list_attach(LIST* dst, LIST* src) {
    // An empty source has nothing to splice: both lists stay as they are.
    if (!dst || !src || src->count == 0) return;
    NODE* first = src->head->next;
    NODE* last = src->tail->prev;
    NODE* dst_last = dst->tail->prev;
    dst_last->next = first;
    first->prev = dst_last;
    last->next = dst->tail;
    dst->tail->prev = last;
    dst->count += src->count;
    src->head->next = src->tail;
    src->tail->prev = src->head;
    src->count = 0;
}
}
