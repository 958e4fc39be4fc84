// SPDX-License-Identifier: Apache-2.0
// Heap accounting for the benchmarks and the leak suite: a malloc interposer that counts every
// allocation made by the calling thread (whoever makes it: the library, the C++ runtime, a peer
// library), and the allocator's own live-byte figure.
#ifndef KOVA_BENCH_ALLOC_COUNT_H
#define KOVA_BENCH_ALLOC_COUNT_H

#include <cstddef>
#include <cstdint>

namespace kova_bench {

// True when the interposer is compiled in (it is left out under sanitizers, which bring their
// own malloc).
bool alloc_counting_enabled();

// malloc, calloc, realloc, aligned allocations made by this thread since start-up.
uint64_t thread_alloc_count();

// Bytes in use on the heap now: the usable sizes of all live blocks as the interposer counted
// them, or the allocator's statistics (mallinfo2) when the interposer is left out.
std::size_t heap_bytes_in_use();

}  // namespace kova_bench

#endif
