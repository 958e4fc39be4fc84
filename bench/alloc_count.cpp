// SPDX-License-Identifier: Apache-2.0
// Counting malloc interposer. The definitions below take the place of the C library's allocation
// entry points for the whole process (an executable's symbols come first in the lookup); each one
// counts and forwards to glibc's own implementation. Operator new ends up here too.
#include "alloc_count.h"

#include <malloc.h>

#include <atomic>
#include <cstdlib>

#if KOVA_BENCH_COUNT_MALLOC

extern "C" {
void* __libc_malloc(size_t bytes);
void* __libc_calloc(size_t count, size_t bytes);
void* __libc_realloc(void* p, size_t bytes);
void* __libc_memalign(size_t align, size_t bytes);
void __libc_free(void* p);
}

namespace {
// Initial-exec TLS of the executable: reading it never allocates, so it is safe inside malloc.
thread_local uint64_t t_allocs = 0;
// Usable bytes of every live block, all threads. Exact, unlike the allocator's own statistics,
// which count blocks parked in its per-thread caches as in use.
std::atomic<int64_t> g_live{0};

void* counted(void* p) {
    if (p != nullptr) {
        g_live.fetch_add(static_cast<int64_t>(malloc_usable_size(p)), std::memory_order_relaxed);
    }
    return p;
}

void uncount(void* p) {
    if (p != nullptr) {
        g_live.fetch_sub(static_cast<int64_t>(malloc_usable_size(p)), std::memory_order_relaxed);
    }
}
}  // namespace

extern "C" {

void* malloc(size_t bytes) {
    ++t_allocs;
    return counted(__libc_malloc(bytes));
}

void* calloc(size_t count, size_t bytes) {
    ++t_allocs;
    return counted(__libc_calloc(count, bytes));
}

void* realloc(void* p, size_t bytes) {
    ++t_allocs;
    // The old block stays alive when realloc fails (other than for size 0).
    const int64_t old = p != nullptr ? static_cast<int64_t>(malloc_usable_size(p)) : 0;
    void* q = __libc_realloc(p, bytes);
    if (q != nullptr || bytes == 0) {
        g_live.fetch_sub(old, std::memory_order_relaxed);
        counted(q);
    }
    return q;
}

void free(void* p) {
    uncount(p);
    __libc_free(p);
}

void* memalign(size_t align, size_t bytes) {
    ++t_allocs;
    return counted(__libc_memalign(align, bytes));
}

void* aligned_alloc(size_t align, size_t bytes) {
    ++t_allocs;
    return counted(__libc_memalign(align, bytes));
}

int posix_memalign(void** out, size_t align, size_t bytes) {
    ++t_allocs;
    // Same contract as glibc's: a power-of-two multiple of the pointer size.
    if (align % sizeof(void*) != 0 || (align & (align - 1)) != 0) return 22; /* EINVAL */
    void* p = __libc_memalign(align, bytes);
    if (p == nullptr) return 12; /* ENOMEM */
    *out = counted(p);
    return 0;
}

}  // extern "C"

namespace kova_bench {
bool alloc_counting_enabled() {
    return true;
}
uint64_t thread_alloc_count() {
    return t_allocs;
}
std::size_t heap_bytes_in_use() {
    return static_cast<std::size_t>(g_live.load());
}
}  // namespace kova_bench

#else

namespace kova_bench {
bool alloc_counting_enabled() {
    return false;
}
uint64_t thread_alloc_count() {
    return 0;
}
// Without the interposer, the allocator's own figure: small blocks plus mmap-backed large ones
// (blocks parked in its per-thread caches count as in use there).
std::size_t heap_bytes_in_use() {
    const struct mallinfo2 mi = mallinfo2();
    return mi.uordblks + mi.hblkhd;
}
}  // namespace kova_bench

#endif
