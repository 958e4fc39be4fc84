// Counting malloc interposer. The definitions below take the place of the C library's allocation
// entry points for the whole process (an executable's symbols come first in the lookup); each one
// counts and forwards to glibc's own implementation. Operator new ends up here too.
#include "alloc_count.h"

#include <malloc.h>

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
}  // namespace

extern "C" {

void* malloc(size_t bytes) {
    ++t_allocs;
    return __libc_malloc(bytes);
}

void* calloc(size_t count, size_t bytes) {
    ++t_allocs;
    return __libc_calloc(count, bytes);
}

void* realloc(void* p, size_t bytes) {
    ++t_allocs;
    return __libc_realloc(p, bytes);
}

void free(void* p) {
    __libc_free(p);
}

void* memalign(size_t align, size_t bytes) {
    ++t_allocs;
    return __libc_memalign(align, bytes);
}

void* aligned_alloc(size_t align, size_t bytes) {
    ++t_allocs;
    return __libc_memalign(align, bytes);
}

int posix_memalign(void** out, size_t align, size_t bytes) {
    ++t_allocs;
    // Same contract as glibc's: a power-of-two multiple of the pointer size.
    if (align % sizeof(void*) != 0 || (align & (align - 1)) != 0) return 22; /* EINVAL */
    void* p = __libc_memalign(align, bytes);
    if (p == nullptr) return 12; /* ENOMEM */
    *out = p;
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
}  // namespace kova_bench

#else

namespace kova_bench {
bool alloc_counting_enabled() {
    return false;
}
uint64_t thread_alloc_count() {
    return 0;
}
}  // namespace kova_bench

#endif

namespace kova_bench {
std::size_t heap_bytes_in_use() {
    const struct mallinfo2 mi = mallinfo2();
    return mi.uordblks + mi.hblkhd;
}
}  // namespace kova_bench
