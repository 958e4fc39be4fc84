// SPDX-License-Identifier: Apache-2.0
/* Every heap allocation of the library goes through these, so tests can count allocations on a
 * path and make the n-th allocation fail. Not exported. */
#ifndef KOVA_MEM_H
#define KOVA_MEM_H

#include <stddef.h>

#ifdef __cplusplus
extern "C" {
#endif

void* kova_mem_malloc(size_t bytes);
void* kova_mem_calloc(size_t count, size_t bytes);
void kova_mem_free(void* p);

/* Test control: after `n` more successful allocations, every allocation fails until the next
 * call; a negative n never fails. */
void kova_mem_fail_after(long n);
/* Allocations attempted since start-up (successful or failed). */
unsigned long kova_mem_alloc_count(void);

#ifdef __cplusplus
}
#endif

#endif
