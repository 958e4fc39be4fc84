// SPDX-License-Identifier: Apache-2.0
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

std::vector<int> values(LIST* l) {
    std::vector<int> out;
    for (NODE* n = l->head->next; n != l->tail; n = n->next)
        out.push_back(*static_cast<int*>(n->data));
    // Walking backwards must see the same elements: prev links are consistent.
    std::vector<int> back;
    for (NODE* n = l->tail->prev; n != l->head; n = n->prev)
        back.insert(back.begin(), *static_cast<int*>(n->data));
    EXPECT_EQ(out, back);
    EXPECT_EQ(out.size(), l->count);
    return out;
}

int g_released = 0;
int g_released_null = 0;
void counting_release(void* p) {
    if (p) {
        ++g_released;
        kova_mem_free(p);
    } else {
        ++g_released_null;
    }
}

TEST(List, CreateIsEmptyAndGetatKeepsInBounds) {
    LIST* l = list_create();
    ASSERT_NE(l, nullptr);
    EXPECT_NE(l->head, l->tail);
    EXPECT_EQ(l->head->prev, nullptr);
    EXPECT_EQ(l->tail->next, nullptr);
    EXPECT_EQ(values(l), (std::vector<int>{}));
    for (int i = 0; i < 3; ++i) list_pushback(l, boxed(i * 10));
    EXPECT_EQ(*static_cast<int*>(list_getat(l, 0)->data), 0);
    EXPECT_EQ(*static_cast<int*>(list_getat(l, 2)->data), 20);
    EXPECT_EQ(list_getat(l, 3), nullptr);
    EXPECT_EQ(list_getat(l, 0xFFFFFFFFu), nullptr);
    EXPECT_EQ(list_getNode(l, 1), list_getat(l, 1));
    list_destory(l, nullptr);
}

TEST(List, InsertAtSentinelsAppendsAndPrepends) {
    LIST* l = list_create();
    insert_after(l, l->tail, boxed(2));   // append
    insert_before(l, l->head, boxed(1));  // prepend
    insert_after(l, l->head, boxed(0));   // prepend
    insert_before(l, l->tail, boxed(3));  // append
    insert_after(l, list_getat(l, 1), boxed(9));
    EXPECT_EQ(values(l), (std::vector<int>{0, 1, 9, 2, 3}));
    list_destory(l, nullptr);
}

TEST(List, RemoveNodeChoosesElementsForSentinels) {
    LIST* l = list_create();
    EXPECT_EQ(remove_node(l, l->head), nullptr);
    EXPECT_EQ(remove_node(l, l->tail), nullptr);
    EXPECT_EQ(l->count, 0u);
    for (int i = 0; i < 4; ++i) list_pushback(l, boxed(i));
    NODE* first = remove_node(l, l->head);
    NODE* last = remove_node(l, l->tail);
    EXPECT_EQ(*static_cast<int*>(first->data), 0);
    EXPECT_EQ(*static_cast<int*>(last->data), 3);
    EXPECT_EQ(first->prev, nullptr);
    EXPECT_EQ(first->next, nullptr);
    EXPECT_EQ(values(l), (std::vector<int>{1, 2}));
    // del_node frees a detached node and hands back its successor (null here).
    EXPECT_EQ(del_node(first, nullptr), nullptr);
    EXPECT_EQ(del_node(last, nullptr), nullptr);
    list_destory(l, nullptr);
}

TEST(List, RemoveatReleasesOnlyInRange) {
    LIST* l = list_create();
    for (int i = 0; i < 3; ++i) list_pushback(l, boxed(i));
    g_released = 0;
    list_removeat(l, 3, counting_release);
    EXPECT_EQ(g_released, 0);
    EXPECT_EQ(l->count, 3u);
    list_removeat(l, 1, counting_release);
    EXPECT_EQ(g_released, 1);
    EXPECT_EQ(values(l), (std::vector<int>{0, 2}));
    list_destory(l, nullptr);
}

TEST(List, DestroyReleasesSentinelsTooAndDelNodeWalksAChain) {
    LIST* l = list_create();
    for (int i = 0; i < 5; ++i) list_pushback(l, boxed(i));
    g_released = g_released_null = 0;
    list_destory(l, counting_release);
    EXPECT_EQ(g_released, 5);
    EXPECT_EQ(g_released_null, 2);

    // Tear a whole chain down node by node, sentinels included.
    l = list_create();
    for (int i = 0; i < 3; ++i) list_pushback(l, boxed(i));
    int freed = 0;
    for (NODE* n = l->head; n != nullptr; ++freed) n = del_node(n, nullptr);
    EXPECT_EQ(freed, 5);
    kova_mem_free(l);
}

TEST(List, AttachSplicesAndLeavesSourceReusable) {
    LIST* dst = list_create();
    LIST* src = list_create();
    list_pushback(dst, boxed(1));
    list_pushback(src, boxed(2));
    list_pushback(src, boxed(3));
    list_attach(dst, src);
    EXPECT_EQ(values(dst), (std::vector<int>{1, 2, 3}));
    EXPECT_EQ(values(src), (std::vector<int>{}));
    list_pushback(src, boxed(4));
    EXPECT_EQ(values(src), (std::vector<int>{4}));
    // An empty source changes nothing, on either side.
    LIST* empty = list_create();
    list_attach(dst, empty);
    EXPECT_EQ(values(dst), (std::vector<int>{1, 2, 3}));
    EXPECT_EQ(empty->head->next, empty->tail);
    list_destory(dst, nullptr);
    list_destory(src, nullptr);
    list_destory(empty, nullptr);
}

}  // namespace
