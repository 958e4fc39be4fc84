// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_list.h
 * @brief Doubly linked list of untyped payloads with head and tail sentinels; positions are
 * 0-based.
 *
 * The list owns its nodes; a payload is released by the list only where an operation takes a
 * release function (without one, `free` is called on non-null payloads).
 *
 * @par Threading
 * No locking: the owner of a list serialises every access to it.
 *
 * @par Real time
 * Inserting allocates one node; removing frees one. Access by position walks from the head
 * (linear time); appending is constant time.
 */
#ifndef KOVA_LIST_H
#define KOVA_LIST_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/** Releases one payload; called also with null (for the sentinels), so it must accept null. */
typedef void (*LIST_RELEASE_FN)(void* data);

/**
 * Creates an empty list.
 * @return the list, owned by the caller (free it with list_destory()); null when memory is short.
 */
KOVA_API LIST* list_create(void);

/**
 * Frees a list with its nodes and payloads.
 * @param list the list; null does nothing.
 * @param release called for every node's payload, the sentinels' nulls included; null = `free`
 *          of each non-null payload.
 */
KOVA_API void list_destory(LIST* list, LIST_RELEASE_FN release);

/**
 * Appends a payload.
 * @param list the list.
 * @param data the payload (owned by the list from now on, in the sense of list_destory()).
 * @return the new node; null for a null list or when memory is short.
 */
KOVA_API NODE* list_pushback(LIST* list, void* data);

/**
 * Inserts a payload after a node; after the tail sentinel means before it (an append).
 * @param list the list.
 * @param node a node of `list`, or one of its sentinels.
 * @param data the payload.
 * @return the new node; null for a null list or node, or when memory is short.
 */
KOVA_API NODE* insert_after(LIST* list, NODE* node, void* data);

/**
 * Inserts a payload before a node; before the head sentinel means after it (a prepend).
 * @param list the list.
 * @param node a node of `list`, or one of its sentinels.
 * @param data the payload.
 * @return the new node; null for a null list or node, or when memory is short.
 */
KOVA_API NODE* insert_before(LIST* list, NODE* node, void* data);

/**
 * Finds the node at a position.
 * @param list the list.
 * @param index the 0-based position. This must be below `list->count`.
 * @return the node (read its payload through `data`); null for a null list or a position out of
 *         range.
 */
KOVA_API NODE* list_getat(LIST* list, uint32_t index);

/**
 * The same function as list_getat(), under a second name.
 * @param list the list.
 * @param index the 0-based position. This must be below `list->count`.
 * @return the node; null for a null list or a position out of range.
 */
KOVA_API NODE* list_getNode(LIST* list, uint32_t index);

/**
 * Removes and frees the node at a position, releasing its payload.
 * @param list the list.
 * @param index the 0-based position; out of range does nothing.
 * @param release releases the payload; null = `free` of a non-null payload.
 */
KOVA_API void list_removeat(LIST* list, uint32_t index, LIST_RELEASE_FN release);

/**
 * Unlinks a node without freeing it; the head sentinel stands for the first element, the tail
 * sentinel for the last.
 * @param list the list.
 * @param node a node of `list`, or one of its sentinels.
 * @return the unlinked node, now owned by the caller (free it with del_node()); null for a null
 *         argument or an empty list.
 */
KOVA_API NODE* remove_node(LIST* list, NODE* node);

/**
 * Frees a node that is no longer linked (or a chain being torn down), releasing its payload.
 * @param node the node; null gives null.
 * @param release releases the payload; null = `free` of a non-null payload.
 * @return the node's former `next`.
 */
KOVA_API NODE* del_node(NODE* node, LIST_RELEASE_FN release);

/**
 * Allocates a node with the given fields; touches no neighbour and no list.
 * @param data the payload.
 * @param prev the `prev` field.
 * @param next the `next` field.
 * @return the node, owned by the caller; null when memory is short.
 */
KOVA_API NODE* new_node(void* data, NODE* prev, NODE* next);

/**
 * Moves all elements of one list, in order, to the end of another; the source is left empty and
 * usable. Allocates nothing.
 * @param dst the destination list; null does nothing.
 * @param src the source list; null or empty does nothing.
 */
KOVA_API void list_attach(LIST* dst, LIST* src);

KOVA_EXTERN_C_END

#endif
