// Helpers for the sound-source tests: scratch files, a heap probe, hand-built source sets.
#ifndef KOVA_TESTS_SOURCE_FIXTURE_H
#define KOVA_TESTS_SOURCE_FIXTURE_H

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "util/kova_mem.h"

#if defined(__SANITIZE_ADDRESS__)
extern "C" size_t __sanitizer_get_current_allocated_bytes(void);  // the sanitizer runtime's
#endif

namespace srcfix {

using Bytes = std::vector<uint8_t>;

// Bytes currently allocated on the heap; equal before and after an operation means no leak.
// Only the sanitizer's allocator counts exactly (glibc keeps freed chunks in per-thread caches
// that it still reports as in use), so leak checks run in the sanitizer build.
#if defined(__SANITIZE_ADDRESS__)
constexpr bool kHeapProbe = true;
inline size_t heap_in_use() {
    return __sanitizer_get_current_allocated_bytes();
}
#else
constexpr bool kHeapProbe = false;
inline size_t heap_in_use() {
    return 0;
}
#endif

// Passes when the heap holds as many bytes as at `before` (always, without the probe).
inline ::testing::AssertionResult heap_back_to(size_t before) {
    const size_t now = heap_in_use();
    if (now == before) return ::testing::AssertionSuccess();
    return ::testing::AssertionFailure()
           << "heap holds " << now << " bytes, " << before << " before";
}

// A scratch directory removed with everything in it.
struct TempDir {
    std::filesystem::path dir;
    TempDir() {
        std::string tmpl = (std::filesystem::temp_directory_path() / "kova_src_XXXXXX").string();
        dir = mkdtemp(tmpl.data());
    }
    ~TempDir() { std::filesystem::remove_all(dir); }
    std::string file(const std::string& name) const { return (dir / name).string(); }
};

inline void write_file(const std::string& path, const Bytes& bytes) {
    std::ofstream(path, std::ios::binary | std::ios::trunc)
        .write(reinterpret_cast<const char*>(bytes.data()),
               static_cast<std::streamsize>(bytes.size()));
}

inline Bytes read_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(in), {});
}

// Deterministic sample bytes, different for every seed.
inline Bytes pattern(size_t n, unsigned seed) {
    Bytes b(n);
    for (size_t i = 0; i < n; ++i)
        b[i] = static_cast<uint8_t>((i * 31u + seed * 97u + (i >> 8)) & 0xFF);
    return b;
}

template <typename T>
T at(const Bytes& b, size_t off) {
    T v;
    std::memcpy(&v, b.data() + off, sizeof(T));
    return v;
}

inline void* dup(const void* p, size_t n) {
    void* q = kova_mem_malloc(n);
    std::memcpy(q, p, n);
    return q;
}

// A source built like the loader builds one; pcm_proc differs from pcm so writers that store
// the working copy are caught.
inline KOVA_SRC* make_src(int slot, const Bytes& pcm, int32_t rpt_start, int32_t rpt_end) {
    auto* s = static_cast<KOVA_SRC*>(kova_mem_calloc(1, sizeof(KOVA_SRC)));
    s->pcm = static_cast<int16_t*>(dup(pcm.data(), pcm.size()));
    s->pcm_proc = static_cast<int16_t*>(kova_mem_calloc(1, pcm.size()));
    s->path = static_cast<char*>(kova_mem_calloc(1, KOVA_PATH_BUF_BYTES));
    s->size = static_cast<int32_t>(pcm.size());
    s->pos = 77;
    s->slot = slot;
    s->origin = KOVA_ORIGIN_FILE;
    s->rpt_start = rpt_start;
    s->rpt_end = rpt_end;
    return s;
}

inline KOVA_FLT_DSC dsc(uint32_t type, double freq, uint32_t enable = 0) {
    KOVA_FLT_DSC d{};
    d.type = type;
    d.freq = freq;
    d.bandwidth = 100.0;
    d.enable = enable;
    d.samplerate = 48000;
    d.channels = 2;
    return d;
}

inline KOVA_TUNE_SET tune(double wn_gain, double file_gain) {
    return KOVA_TUNE_SET{0.9, 0.3, 1, 1.5, 1, 0.25, wn_gain, file_gain, 0.7, 0.8, 0.6};
}

// An empty set as the engine prepares one for reading a file; tune filled with a marker.
inline KOVA_SRCSET* prepared_set() {
    auto* set = static_cast<KOVA_SRCSET*>(kova_mem_calloc(1, sizeof(KOVA_SRCSET)));
    set->filters = list_create();
    set->tune = static_cast<KOVA_TUNE_SET*>(kova_mem_malloc(sizeof(KOVA_TUNE_SET)));
    *set->tune = tune(-7.0, -7.0);
    set->tune->end_gain = -7.0;
    return set;
}

inline KOVA_SRCSET* make_set(const std::vector<KOVA_FLT_DSC>& filters, const KOVA_TUNE_SET& t,
                             KOVA_SRC* start, KOVA_SRC* loop, KOVA_SRC* end) {
    KOVA_SRCSET* set = prepared_set();
    *set->tune = t;
    for (const auto& d : filters) list_pushback(set->filters, dup(&d, sizeof d));
    set->src[0] = start;
    set->src[1] = loop;
    set->src[2] = end;
    return set;
}

// Saves `set` to `path` through the access layer; returns the writer's sum.
inline int save(KOVA_SRCSET* set, const std::string& path, int rate = 48000, int channels = 2) {
    TARQ_MFAL m;
    EXPECT_EQ(tarq_mfal_init(path.c_str(), &m), 0);
    void* h = m.open(&m, 1);
    EXPECT_NE(h, nullptr);
    const int sum = kova_write_srcset(rate, channels, set, &m, h);
    m.close(h);
    kova_mem_free(m.path);
    return sum;
}

inline std::vector<KOVA_FLT_DSC> filters_of(const KOVA_SRCSET* set) {
    std::vector<KOVA_FLT_DSC> out;
    for (NODE* n = set->filters->head->next; n != set->filters->tail; n = n->next) {
        out.push_back(*static_cast<KOVA_FLT_DSC*>(n->data));
    }
    return out;
}

inline bool same_dsc(const KOVA_FLT_DSC& a, const KOVA_FLT_DSC& b) {
    return a.type == b.type && a.freq == b.freq && a.bandwidth == b.bandwidth &&
           a.enable == b.enable && a.samplerate == b.samplerate && a.channels == b.channels;
}

}  // namespace srcfix

#endif
