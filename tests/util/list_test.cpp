// SPDX-License-Identifier: Apache-2.0
// The doubly linked list with head and tail sentinels: every operation checked by walking the
// list both ways, so a broken prev link or a wrong count shows.
#include <gtest/gtest.h>

#include <vector>

#include "kova/kova_list.h"
#include "util/kova_mem.h"

namespace {

int* boxed(int v) {
    auto* p = static_cast<int*>(kova_mem_malloc(sizeof(int)));
    *p = v;
    return p;
}

LIST* list_of(std::vector<int> v) {
    LIST* l = list_create();
    for (int x : v) list_pushback(l, boxed(x));
    return l;
}

int value(const NODE* n) {
    return *static_cast<int*>(n->data);
}

std::vector<int> values(LIST* l) {
    std::vector<int> out, back;
    for (NODE* n = l->head->next; n != l->tail; n = n->next) out.push_back(value(n));
    for (NODE* n = l->tail->prev; n != l->head; n = n->prev) back.insert(back.begin(), value(n));
    EXPECT_EQ(out, back) << "prev links";
    EXPECT_EQ(out.size(), l->count);
    EXPECT_TRUE(l->head->prev == nullptr && l->tail->next == nullptr);
    return out;
}

int g_released = 0, g_released_null = 0;
void counting_release(void* p) {
    ++(p ? g_released : g_released_null);
    if (p) kova_mem_free(p);
}

TEST(List, GetatKeepsInBoundsAndInsertsAtSentinelsAppendOrPrepend) {
    LIST* l = list_create();
    insert_after(l, l->tail, boxed(2));
    insert_before(l, l->head, boxed(1));
    insert_after(l, l->head, boxed(0));
    insert_before(l, l->tail, boxed(3));
    insert_after(l, list_getat(l, 1), boxed(9));
    EXPECT_EQ(values(l), (std::vector<int>{0, 1, 9, 2, 3}));
    EXPECT_EQ(value(list_getat(l, 4)), 3);
    EXPECT_EQ(list_getat(l, 0xFFFFFFFFu), nullptr);
    EXPECT_EQ(list_getNode(l, 1), list_getat(l, 1));
    list_destory(l, nullptr);
}

TEST(List, RemovalsTakeElementsNeverSentinels) {
    LIST* l = list_create();  // an empty list gives up neither sentinel
    EXPECT_EQ(remove_node(l, l->head), nullptr);
    EXPECT_EQ(remove_node(l, l->tail), nullptr);
    EXPECT_EQ(l->count, 0u);
    list_destory(l, nullptr);

    l = list_of({0, 1, 2, 3, 4});
    NODE* first = remove_node(l, l->head);
    NODE* last = remove_node(l, l->tail);
    EXPECT_EQ(value(first), 0);
    EXPECT_EQ(value(last), 4);
    EXPECT_TRUE(first->prev == nullptr && first->next == nullptr);
    EXPECT_EQ(del_node(first, nullptr), nullptr);
    EXPECT_EQ(del_node(last, nullptr), nullptr);
    g_released = 0;
    list_removeat(l, 3, counting_release);  // out of range: nothing released
    list_removeat(l, 1, counting_release);
    EXPECT_EQ(g_released, 1);
    EXPECT_EQ(values(l), (std::vector<int>{1, 3}));
    g_released = g_released_null = 0;
    list_destory(l, counting_release);  // the sentinels' null data is handed over too
    EXPECT_EQ(g_released, 2);
    EXPECT_EQ(g_released_null, 2);

    // del_node hands back the successor: a whole chain torn down node by node.
    l = list_of({0, 1, 2});
    int freed = 0;
    for (NODE* n = l->head; n != nullptr; ++freed) n = del_node(n, nullptr);
    EXPECT_EQ(freed, 5);
    kova_mem_free(l);
}

TEST(List, AttachSplicesAndLeavesSourceReusable) {
    LIST* dst = list_of({1});
    LIST* src = list_of({2, 3});
    LIST* empty = list_create();
    list_attach(dst, src);
    EXPECT_EQ(values(dst), (std::vector<int>{1, 2, 3}));
    EXPECT_EQ(values(src), (std::vector<int>{}));
    list_pushback(src, boxed(4));
    EXPECT_EQ(values(src), (std::vector<int>{4}));
    list_attach(dst, empty);
    EXPECT_EQ(values(dst), (std::vector<int>{1, 2, 3}));
    EXPECT_EQ(values(empty), (std::vector<int>{}));
    for (LIST* l : {dst, src, empty}) list_destory(l, nullptr);
}

}  // namespace
