// SPDX-License-Identifier: Apache-2.0
#include "fuzz_support.h"

#include <sanitizer/asan_interface.h>  // the poisoning macros do nothing without ASan

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <fstream>

#include "util/kova_mem.h"

namespace kova_fuzz {

void fail(const char* what, const char* file, int line) {
    std::fprintf(stderr, "property violated: %s (%s:%d)\n", what, file, line);
    std::abort();
}

void ScratchFile::rewrite(const void* data, size_t size) const {
    std::ofstream out(path_, std::ios::binary | std::ios::trunc);
    out.write(static_cast<const char*>(data), static_cast<std::streamsize>(size));
    FUZZ_CHECK(out.good());
}

namespace {

constexpr int32_t kMaxPcmBytes = 1 << 20;
constexpr size_t kGuard = 32;
constexpr uint8_t kGuardByte = 0xA5;
// 8-byte aligned, so the guard after a buffer of even size starts on a shadow granule.
alignas(16) uint8_t g_arena[kMaxPcmBytes + 64];

}  // namespace

int32_t checked_gen(KOVA_CTX* ctx, const KOVA_PARAM& ev, int32_t buffer_bytes) {
    // The buffer ends where guard bytes begin that must stay untouched (poisoned for
    // AddressSanitizer, checked by value in any build). The samples start 2-byte aligned; an
    // odd size leaves one spare byte, which joins the guard.
    FUZZ_CHECK(buffer_bytes <= kMaxPcmBytes);
    const size_t size = buffer_bytes > 0 ? static_cast<size_t>(buffer_bytes) : 0;
    uint8_t* const end = g_arena + kMaxPcmBytes;
    uint8_t* const data = end - (size + 1) / 2 * 2;
    uint8_t* const guard = data + size;
    const size_t guard_bytes = static_cast<size_t>(end - guard) + kGuard;
    std::memset(guard, kGuardByte, guard_bytes);
    KOVA_PCMBUF out{reinterpret_cast<int16_t*>(data), buffer_bytes};
    const unsigned long allocs = kova_mem_alloc_count();
    ASAN_POISON_MEMORY_REGION(guard, guard_bytes);
    const int32_t bytes = kova_gen_sounds(ctx, &ev, &out);
    ASAN_UNPOISON_MEMORY_REGION(guard, guard_bytes);
    FUZZ_CHECK(kova_mem_alloc_count() == allocs);  // the per-event path allocates nothing
    FUZZ_CHECK(bytes >= 0);
    FUZZ_CHECK(bytes % 2 == 0);  // whole 16-bit samples
    FUZZ_CHECK(bytes <= static_cast<int32_t>(size));
    FUZZ_CHECK(std::all_of(guard, guard + guard_bytes, [](uint8_t b) { return b == kGuardByte; }));
    return bytes;
}

void short_stroke(KOVA_CTX* ctx) {
    constexpr uint32_t kActions[] = {KOVA_ACTION_START, KOVA_ACTION_MOVE, KOVA_ACTION_MOVE,
                                     KOVA_ACTION_END};
    KOVA_PARAM ev{100.0f, 200.0f, 1000, 0.0f, 0};
    for (const uint32_t action : kActions) {
        ev.action = action;
        checked_gen(ctx, ev, 256);
        ev.x += 7.0f;
        ev.y += 11.0f;
        ev.time += 4;
    }
}

bool same_tune(const KOVA_TUNE_SET& a, const KOVA_TUNE_SET& b) {
    const auto f = [](const auto& x, const auto& y) { return std::memcmp(&x, &y, sizeof x) == 0; };
    return f(a.gain, b.gain) && f(a.pan, b.pan) && f(a.osc_enable, b.osc_enable) &&
           f(a.osc_depth, b.osc_depth) && f(a.sharp_enable, b.sharp_enable) &&
           f(a.sharpness, b.sharpness) && f(a.wn_gain, b.wn_gain) && f(a.file_gain, b.file_gain) &&
           f(a.start_gain, b.start_gain) && f(a.loop_gain, b.loop_gain) &&
           f(a.end_gain, b.end_gain);
}

}  // namespace kova_fuzz
