// SPDX-License-Identifier: Apache-2.0
// Helpers for the sound-source tests: scratch files and hand-built source sets.
#ifndef KOVA_TESTS_SOURCE_FIXTURE_H
#define KOVA_TESTS_SOURCE_FIXTURE_H

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "support/temp_dir.h"
#include "util/kova_mem.h"

using Bytes = std::vector<uint8_t>;

using kova_test::TempDir;

inline void write_file(const std::string& path, const Bytes& b) {
    std::ofstream(path, std::ios::binary).write(reinterpret_cast<const char*>(b.data()), b.size());
}
inline Bytes read_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(in), {});
}
inline Bytes pattern(size_t n, unsigned seed) {
    Bytes b(n);
    for (size_t i = 0; i < n; ++i) b[i] = static_cast<uint8_t>(i * 31 + seed * 97 + (i >> 8));
    return b;
}
inline void* dup(const void* p, size_t n) {
    return std::memcpy(kova_mem_malloc(n), p, n);
}

// A source as the loader makes one, but with pos 77 and a zeroed working copy, so a writer that
// stores the working copy or a reader that keeps pos is caught.
inline KOVA_SRC* make_src(int slot, const Bytes& pcm, int32_t rpt_start, int32_t rpt_end) {
    auto* s = static_cast<KOVA_SRC*>(kova_mem_malloc(sizeof(KOVA_SRC)));
    *s = KOVA_SRC{static_cast<int16_t*>(dup(pcm.data(), pcm.size())),
                  static_cast<int16_t*>(kova_mem_calloc(1, pcm.size())),
                  static_cast<char*>(kova_mem_calloc(1, KOVA_PATH_BUF_BYTES)),
                  static_cast<int32_t>(pcm.size()),
                  77,
                  slot,
                  KOVA_ORIGIN_FILE,
                  rpt_start,
                  rpt_end};
    return s;
}
inline KOVA_FLT_DSC dsc(uint32_t type, double freq, uint32_t enable = 0) {
    return KOVA_FLT_DSC{type, freq, 100.0, enable, 48000, 2};
}
inline KOVA_TUNE_SET tune(double wn_gain, double file_gain, double end_gain = 0.6) {
    return KOVA_TUNE_SET{0.9, 0.3, 1, 1.5, 1, 0.25, wn_gain, file_gain, 0.7, 0.8, end_gain};
}

// A set holding what is given; with no arguments, an empty set as the engine prepares one for
// reading a file, its tune set marked with -7.
inline KOVA_SRCSET* make_set(const std::vector<KOVA_FLT_DSC>& filters = {},
                             const KOVA_TUNE_SET& t = tune(-7, -7, -7), KOVA_SRC* start = nullptr,
                             KOVA_SRC* loop = nullptr, KOVA_SRC* end = nullptr) {
    auto* set = static_cast<KOVA_SRCSET*>(kova_mem_calloc(1, sizeof(KOVA_SRCSET)));
    *set = KOVA_SRCSET{
        {start, loop, end}, list_create(), static_cast<KOVA_TUNE_SET*>(dup(&t, 88)), 0.6};
    for (const auto& d : filters) list_pushback(set->filters, dup(&d, sizeof d));
    return set;
}

// A set read from `path` into an empty set (make_set()), with the reader's result.
struct Read {
    KOVA_SRCSET* set = make_set();
    int rc;
    explicit Read(const std::string& path) : rc(kova_open_source(set, path.c_str())) {}
    ~Read() { kova_free_sourceset(set); }
    Read(const Read&) = delete;
    Read& operator=(const Read&) = delete;
};

// Saves `set` through the access layer and releases it; returns the writer's sum.
inline int save(KOVA_SRCSET* set, const std::string& path, int rate = 48000, int channels = 2) {
    TARQ_MFAL m;
    tarq_mfal_init(path.c_str(), &m);
    void* h = m.open(&m, 1);
    const int sum = kova_write_srcset(rate, channels, set, &m, h);
    m.close(h);
    kova_mem_free(m.path);
    kova_free_sourceset(set);
    return sum;
}

// Offset and size of slots 0, 1 and 2 as the file query gives them; -7 where it wrote nothing.
inline std::vector<int> pcminfo(const std::string& p, int want_rc = KOVA_OK) {
    std::vector<int> o(6, -7);
    EXPECT_EQ(kova_get_pcminfo_fromfile(p.c_str(), &o[0], &o[1], &o[2], &o[3], &o[4], &o[5]),
              want_rc);
    return o;
}

#endif
