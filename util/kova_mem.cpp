// SPDX-License-Identifier: Apache-2.0
#include "kova_mem.h"

#include <atomic>
#include <cstdlib>

namespace {
std::atomic<long> g_fail_after{-1};
std::atomic<unsigned long> g_count{0};

bool should_fail() {
    g_count.fetch_add(1, std::memory_order_relaxed);
    long left = g_fail_after.load(std::memory_order_relaxed);
    if (left < 0) return false;
    if (left == 0) return true;
    g_fail_after.fetch_sub(1, std::memory_order_relaxed);
    return false;
}
}  // namespace

extern "C" {

void* kova_mem_malloc(size_t bytes) { return should_fail() ? nullptr : std::malloc(bytes); }

void* kova_mem_calloc(size_t count, size_t bytes) {
    return should_fail() ? nullptr : std::calloc(count, bytes);
}

void kova_mem_free(void* p) { std::free(p); }

void kova_mem_fail_after(long n) { g_fail_after.store(n, std::memory_order_relaxed); }

unsigned long kova_mem_alloc_count(void) { return g_count.load(std::memory_order_relaxed); }
}
