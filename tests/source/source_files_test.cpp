// SPDX-License-Identifier: Apache-2.0
// The file-access layer every file of the library goes through, and source-set files read back by
// the set reader and the engine-less queries, from hand-built sets saved through the writer: the
// working copy through the stored filters, what the queries make of a file, and hostile files
// (every truncation, refused counts, oversized payloads). Writer, layout and byte images are
// pinned by the cross-machine test; random and mutated files are the set-file fuzzer's part
// (fuzz/fuzz_srcset_file.cpp), and its saved regressions replay under ctest.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstring>
#include <filesystem>
#include <functional>

#include "kova/kova_dsp.h"
#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "support/temp_dir.h"
#include "util/kova_mem.h"

namespace {

using Bytes = std::vector<uint8_t>;

using kova_test::TempDir;
const auto read_file = kova_test::read_file<Bytes>;

Bytes pattern(size_t n, unsigned seed) {
    Bytes b(n);
    for (size_t i = 0; i < n; ++i) b[i] = static_cast<uint8_t>(i * 31 + seed * 97 + (i >> 8));
    return b;
}
void* dup(const void* p, size_t n) {
    return std::memcpy(kova_mem_malloc(n), p, n);
}

// A source as the loader makes one, but with pos 77 and a zeroed working copy, so a writer that
// stores the working copy or a reader that keeps pos is caught.
KOVA_SRC* make_src(int slot, const Bytes& pcm, int32_t rpt_start, int32_t rpt_end) {
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
KOVA_FLT_DSC dsc(uint32_t type, double freq, uint32_t enable = 0) {
    return KOVA_FLT_DSC{type, freq, 100.0, enable, 48000, 2};
}
KOVA_TUNE_SET tune(double wn_gain, double file_gain, double end_gain = 0.6) {
    return KOVA_TUNE_SET{0.9, 0.3, 1, 1.5, 1, 0.25, wn_gain, file_gain, 0.7, 0.8, end_gain};
}

// A set holding what is given; with no arguments, an empty set as the engine prepares one for
// reading a file, its tune set marked with -7.
KOVA_SRCSET* make_set(const std::vector<KOVA_FLT_DSC>& filters = {},
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

// A file opened through the access layer, as the library opens every file.
struct Opened {
    TARQ_MFAL m{};
    void* h;
    Opened(const std::string& path, int mode)
        : h(tarq_mfal_init(path.c_str(), &m) ? nullptr : m.open(&m, mode)) {}
    ~Opened() {
        if (h) m.close(h);
        kova_mem_free(m.path);
    }
};

// Saves `set` through the access layer and releases it.
void save(KOVA_SRCSET* set, const std::string& path) {
    Opened f(path, 1);
    kova_write_srcset(48000, 2, set, &f.m, f.h);
    kova_free_sourceset(set);
}

TEST(SrcsetFile, EnabledFiltersRebuildTheWorkingCopy) {
    TempDir t;
    const Bytes loop = pattern(9600, 7);
    const KOVA_FLT_DSC lo = dsc(KOVA_FLT_LOWPASS, 500.0, 1), hi = dsc(KOVA_FLT_HIGHPASS, 2000.0, 1);
    save(make_set({lo, hi}, tune(0, 0.4), nullptr, make_src(1, loop, 0, 9600)), t.file("f"));
    Read r(t.file("f"));
    ASSERT_EQ(r.rc, KOVA_OK);
    Bytes expect = loop;  // the payload through a bank of the same filters
    KOVA_SRCSET* bank = make_set({lo, hi});
    kova_proc_filters(reinterpret_cast<int16_t*>(expect.data()), 9600, bank->filters);
    kova_free_sourceset(bank);
    ASSERT_NE(expect, loop);
    EXPECT_EQ(std::memcmp(r.set->src[1]->pcm, loop.data(), 9600), 0);
    EXPECT_EQ(std::memcmp(r.set->src[1]->pcm_proc, expect.data(), 9600), 0);
}

std::string printed(const std::function<int()>& query, int want_rc) {
    fflush(stdout);
    testing::internal::CaptureStdout();
    EXPECT_EQ(query(), want_rc);
    fflush(stdout);
    return testing::internal::GetCapturedStdout();
}

// A file with two filters of one type: the queries' lines, the stored tune set and the last filter
// of the type. (Slot offsets: the tool's inspect test; outputs of absent items left alone: the
// set-file fuzzer, on every input.)
TEST(FileQueries, PrintTheirLinesAndTakeTheLastFilterOfAType) {
    TempDir t;
    const std::string p = t.file("b");
    save(make_set({dsc(KOVA_FLT_HIGHPASS, 200.0), dsc(KOVA_FLT_HIGHPASS, 900.0, 1)}, tune(0.3, 0.0),
                  nullptr, make_src(1, pattern(8820, 1), 0, 4410)),
         p);
    KOVA_TUNE_SET tn{};
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(p.c_str(), &tn); }, 0),
              "kova_get_tuneset_fromfile(" + p + ")\n");
    EXPECT_TRUE(tn.sharpness == 0.25 && tn.file_gain == 0.3 && tn.wn_gain == 0.0);
    KOVA_FLT_DSC out[4] = {dsc(7, 0), dsc(7, 0), dsc(7, 0), dsc(7, 0)};
    EXPECT_EQ(printed([&] { return kova_get_filters_fromfile(p.c_str(), out); }, 0),
              "kova_get_filters_fromfile(" + p + ")\n");
    EXPECT_TRUE(out[1].type == 1 && out[1].freq == 900.0 && out[1].enable == 1);
    // The line for a missing or null path (the codes are rows of the contract table).
    const std::string missing = t.file("missing");
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(missing.c_str(), &tn); }, -3),
              "kova_get_tuneset_fromfile(" + missing + ") failed \n");
    EXPECT_EQ(printed([&] { return kova_get_tuneset_fromfile(nullptr, &tn); }, -3),
              "kova_get_tuneset_fromfile((null)) failed \n");
}

// Two enabled filters and sources of 1000, 3000 and 500 bytes whose records start at kRecord.
constexpr size_t kRecord[3] = {192, 1240, 4288};
struct Base {
    TempDir t;
    Bytes pcm[3] = {pattern(1000, 1), pattern(3000, 2), pattern(500, 3)};
    std::string path = t.file("h");
    Bytes file;
    Base() {
        save(make_set({dsc(KOVA_FLT_BANDPASS, 1000.0, 1), dsc(KOVA_FLT_LOWPASS, 3000.0, 1)},
                      tune(0, 0.4), make_src(0, pcm[0], 100, 1000), make_src(1, pcm[1], 0, 3000),
                      make_src(2, pcm[2], 0, 500)),
             path);
        file = read_file(path);
    }
    Bytes with(size_t off, const char* bytes, size_t n = 4) const {
        Bytes b = file;
        std::memcpy(b.data() + off, bytes, n);
        return b;
    }
};

// `bytes` written to the folder's file "h" and read as a set, checked for what the engine relies
// on. That every query answers any file that opens is a property of the set-file fuzzer, checked on
// every input it replays or makes.
struct Probe : Read {
    Probe(const TempDir& t, const Bytes& bytes) : Read(t.write("h", bytes)) {
        EXPECT_LE(set->filters->count, 64u);
        for (NODE* n = set->filters->head->next; n != set->filters->tail; n = n->next) {
            const auto* d = static_cast<KOVA_FLT_DSC*>(n->data);
            EXPECT_TRUE(d->type < 4 && d->channels <= 8);
        }
        for (int slot = 0; slot < 3; ++slot) {
            const KOVA_SRC* s = set->src[slot];
            if (!s) continue;
            EXPECT_TRUE(s->size >= 0 && s->size <= (slot == 1 ? 192000 : 38400));
            EXPECT_TRUE(s->rpt_start >= 0 && s->rpt_start <= s->size && s->rpt_end >= 0 &&
                        s->rpt_end <= s->size && s->pos == 0);
        }
    }
};

TEST(HostileFile, EveryTruncationReadsWhatIsThereAndNothingElse) {
    Base b;
    for (size_t len = 0; len <= b.file.size(); ++len) {
        SCOPED_TRACE(len);
        const Probe p(b.t, Bytes(b.file.begin(), b.file.begin() + len));
        ASSERT_EQ(p.rc, KOVA_OK);
        // A descriptor cut short counts (zeros where the file ended).
        EXPECT_EQ(p.set->filters->count, len < 4 ? 0 : std::min<size_t>(2, (len + 35) / 40));
        // end_gain lies at 164..171; where the file ends the record keeps its earlier -7.
        EXPECT_TRUE((len > 164 && len < 172) || p.set->tune->end_gain == (len >= 172 ? 0.6 : -7));
        for (int slot = 0; slot < 3; ++slot) {
            const size_t payload = kRecord[slot] + 48;
            const size_t kept = len > payload ? std::min(b.pcm[slot].size(), len - payload) : 0;
            const KOVA_SRC* s = p.set->src[slot];
            // A record read in part is a source holding what of its payload was there.
            ASSERT_EQ(s != nullptr, len > kRecord[slot]) << slot;
            EXPECT_TRUE(!s ||
                        (s->size == int32_t(kept) && !memcmp(s->pcm, b.pcm[slot].data(), kept)));
        }
    }
}

TEST(HostileFile, CountsAboveTheLimitRefuseTheFileUntouched) {
    Base b;
    for (const char* count : {"\x41\0\0\0", "\xff\xff\xff\x7f"}) {  // 65, INT32_MAX
        const Probe p(b.t, b.with(0, count));
        EXPECT_EQ(p.rc, KOVA_ERR_INVALID_PARAM);
        EXPECT_TRUE(p.set->filters->count == 0 && p.set->tune->file_gain == -7 && !p.set->src[1]);
    }
    for (const char* count : {"\x40\0\0\0", "\x03\0\0\0", "\xfb\xff\xff\xff", "\0\0\0\x80"}) {
        EXPECT_EQ(Probe(b.t, b.with(0, count)).rc, KOVA_OK);  // 64, 3, -5, INT32_MIN read on
    }
    // The filter query follows any count: the descriptors there are read.
    Bytes two = b.with(0, "\xe8\x03\0\0");  // 1000 filters, only two of them there
    two.resize(4 + 2 * 40);
    b.t.write("h", two);
    KOVA_FLT_DSC f[4] = {};
    printed([&] { return kova_get_filters_fromfile(b.path.c_str(), f); }, KOVA_OK);
    EXPECT_TRUE(f[KOVA_FLT_BANDPASS].freq == 1000.0 && f[KOVA_FLT_LOWPASS].freq == 3000.0);
}

// Oversized payloads are cut at the slot limit and the next record is still found. (Bad
// descriptors, sizes, slot fields, flags and rates are inputs of the set-file fuzzer.)
TEST(HostileFile, OversizedPayloadsAreCutAndTheNextRecordFound) {
    Base b;
    save(make_set({}, tune(0, 0.4), make_src(0, pattern(50000, 4), 0, 50000),
                  make_src(1, pattern(300000, 5), 0, 300000), make_src(2, b.pcm[2], 0, 500)),
         b.path);
    const Probe big(b.t, read_file(b.path));
    ASSERT_EQ(big.rc, KOVA_OK);
    EXPECT_TRUE(big.set->src[0]->size == 38400 &&
                !memcmp(big.set->src[0]->pcm, pattern(38400, 4).data(), 38400));
    EXPECT_TRUE(big.set->src[1]->size == 192000 && big.set->src[1]->rpt_end == 192000);
    EXPECT_EQ(memcmp(big.set->src[2]->pcm, b.pcm[2].data(), 500), 0);
}

TEST(FileAccess, PathLimitPositionsAndSize) {
    TempDir t;
    std::filesystem::create_directory(t.file(std::string(250, 'd')));
    const std::string name =
        std::string(250, 'd') + "/" + std::string(510 - t.path.size() - 251, 'f');
    const Bytes data = pattern(1000, 2);
    const std::string path = t.write(name, data);                // 511 characters
    EXPECT_EQ(Opened(t.write(name + "g", data), 0).h, nullptr);  // 512: refused though it exists
    EXPECT_EQ(Opened(t.file("missing"), 0).h, nullptr);
    Opened f(path, 2);  // bit 0 clear: read-only
    ASSERT_NE(f.h, nullptr);
    int64_t size = 0, pos = -1, to = 400, zero = 0, neg = -3, fwd = 250;
    EXPECT_EQ(f.m.setpos(f.h, &to) + f.m.getsize(f.h, &size) + f.m.getpos(f.h, &pos), 0);
    EXPECT_EQ(size, 1000);
    EXPECT_EQ(pos, 400);  // getsize put the position back
    EXPECT_EQ(f.m.skip(f.h, &zero) + f.m.skip(f.h, &neg) + f.m.setpos(f.h, &neg), -3);
    EXPECT_EQ(f.m.skip(f.h, &fwd), 0);  // the refused moves left the position at 400
    uint8_t b = 0;
    EXPECT_EQ(f.m.read(f.h, &b, 1), 1);
    EXPECT_EQ(b, data[650]);
    EXPECT_EQ(f.m.write(f.h, &b, 1), -1);
}

TEST(FileAccess, WriteOpenCreates0644AndKeepsTheOldTail) {
    TempDir t;
    const mode_t old = umask(022);
    EXPECT_NE(Opened(t.file("new"), 1).h, nullptr);
    umask(old);
    struct stat st {};
    ASSERT_EQ(stat(t.file("new").c_str(), &st), 0);
    EXPECT_EQ(st.st_mode & 0777, 0644u);
    t.write("old", Bytes{'A', 'B', 'C', 'D'});
    {
        Opened f(t.file("old"), 1);
        EXPECT_EQ(f.m.write(f.h, "xy", 2), 2);
        // A handle holding no descriptor is only freed (the leak checker sees the rest).
        f.m.close(std::memset(kova_mem_malloc(4), 0xFF, 4));
    }
    EXPECT_EQ(read_file(t.file("old")), (Bytes{'x', 'y', 'C', 'D'}));
}

}  // namespace
