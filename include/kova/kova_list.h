/* Doubly linked list of untyped payloads with head and tail sentinels; positions are 0-based. */
#ifndef KOVA_LIST_H
#define KOVA_LIST_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

typedef void (*LIST_RELEASE_FN)(void* data);

KOVA_API LIST* list_create(void);
KOVA_API void list_destory(LIST* list, LIST_RELEASE_FN release);
KOVA_API NODE* list_pushback(LIST* list, void* data);
KOVA_API NODE* insert_after(LIST* list, NODE* node, void* data);
KOVA_API NODE* insert_before(LIST* list, NODE* node, void* data);
KOVA_API NODE* list_getat(LIST* list, uint32_t index);
KOVA_API NODE* list_getNode(LIST* list, uint32_t index); /* the same function as list_getat */
KOVA_API void list_removeat(LIST* list, uint32_t index, LIST_RELEASE_FN release);
KOVA_API NODE* remove_node(LIST* list, NODE* node);
KOVA_API NODE* del_node(NODE* node, LIST_RELEASE_FN release);
KOVA_API NODE* new_node(void* data, NODE* prev, NODE* next);
KOVA_API void list_attach(LIST* dst, LIST* src);

KOVA_EXTERN_C_END

#endif
