// SPDX-License-Identifier: Apache-2.0
// The byte language of the file fuzz targets: a file built from chunks, so that an input of a
// few hundred bytes can stand for a source-set file whose payloads reach the slot limits
// (38400/192000/38400 bytes) and beyond, while the bytes that matter (counts, records, sizes)
// stay literal and are mutated directly.
//
// Layout, until the input ends:
//   u8 op = kRunOp: run: u24 length (modulo kMaxRunBytes), u8 seed: that many bytes of a ramp
//                   (see run_byte);
//   u8 op, other:   literal: u16 length, then that many bytes (fewer where the input ends).
// Runs take one op value only, so that random mutations seldom turn a literal into a run of
// hundreds of kilobytes: the inputs that reach the slot limits descend from seeds that do.
// The file never grows beyond kMaxFileBytes; chunks past it are cut.
#ifndef KOVA_FUZZ_FILE_SCRIPT_H
#define KOVA_FUZZ_FILE_SCRIPT_H

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <vector>

namespace kova_fuzz {

constexpr size_t kMaxFileBytes = 320000;  // every slot limit, the records, some 50 KB to spare
constexpr size_t kMaxRunBytes = 262144;
constexpr uint8_t kRunOp = 0x52;

// A run's bytes: 16-bit samples that climb in steps of `seed`, like a sawtooth.
inline uint8_t run_byte(size_t i, uint8_t seed) {
    const auto sample = static_cast<uint16_t>((i / 2) * (seed | 1u) * 64u);
    return static_cast<uint8_t>(i % 2 ? sample >> 8 : sample & 0xFF);
}

// Fills dst[0..n) with `pattern` repeated; not instrumented, as it loops per byte.
__attribute__((no_sanitize("coverage"))) inline void fill_repeating(uint8_t* dst, size_t n,
                                                                    const uint8_t* pattern,
                                                                    size_t period) {
    for (size_t i = 0; period > 0 && i < n; ++i) dst[i] = pattern[i % period];
}

// One period of a run: the samples repeat every 1024 (65536 / 64) samples.
constexpr size_t kRunPeriod = 2048;

// Not instrumented: decoding is no library behaviour to explore, and it loops per byte.
__attribute__((no_sanitize("coverage"))) inline std::vector<uint8_t> expand_file(
    const uint8_t* data, size_t size) {
    std::vector<uint8_t> file;
    size_t at = 0;
    auto take = [&](size_t n) {
        uint32_t v = 0;
        for (size_t k = 0; k < n && at < size; ++k)
            v |= static_cast<uint32_t>(data[at++]) << (8 * k);
        return v;
    };
    while (at < size && file.size() < kMaxFileBytes) {
        const uint8_t op = data[at++];
        const size_t room = kMaxFileBytes - file.size();
        if (op != kRunOp) {
            const size_t n = std::min<size_t>({take(2), size - at, room});  // in this order
            file.insert(file.end(), data + at, data + at + n);
            at += n;
        } else {
            const size_t n = std::min<size_t>(take(3) % kMaxRunBytes, room);
            const auto seed = static_cast<uint8_t>(take(1));
            uint8_t period[kRunPeriod];
            for (size_t i = 0; i < kRunPeriod; ++i) period[i] = run_byte(i, seed);
            const size_t base = file.size();
            file.resize(base + n);
            fill_repeating(file.data() + base, n, period, kRunPeriod);
        }
    }
    return file;
}

}  // namespace kova_fuzz

#endif
