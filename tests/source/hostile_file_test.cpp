// SPDX-License-Identifier: Apache-2.0
// Hand-made hostile set files: every truncation, refused counts, bad fields. Random and mutated
// files are the set-file fuzzer's part (fuzz/fuzz_srcset_file.cpp), and its saved regressions
// replay under ctest.
#include "source_fixture.h"

namespace {

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

// `bytes` written to `path` and read as a set, checked for what the engine relies on. That every
// query answers any file that opens is a property of the set-file fuzzer, checked on every input
// it replays or makes.
struct Probe : Read {
    Probe(const std::string& path, const Bytes& bytes) : Read((write_file(path, bytes), path)) {
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
        const Probe p(b.path, Bytes(b.file.begin(), b.file.begin() + len));
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
        const Probe p(b.path, b.with(0, count));
        EXPECT_EQ(p.rc, KOVA_ERR_INVALID_PARAM);
        EXPECT_TRUE(p.set->filters->count == 0 && p.set->tune->file_gain == -7 && !p.set->src[1]);
    }
    for (const char* count : {"\x40\0\0\0", "\x03\0\0\0", "\xfb\xff\xff\xff", "\0\0\0\x80"}) {
        EXPECT_EQ(Probe(b.path, b.with(0, count)).rc, KOVA_OK);  // 64, 3, -5, INT32_MIN read on
    }
}

TEST(HostileFile, BadDescriptorsSizesSlotsRepeatPointsAndRate) {
    Base b;
    // A stored rate of 0 gives the repeat query no duration (no division by zero).
    KOVA_RPT_INFO r{};
    write_file(b.path, b.with(184, "\0\0\0\0"));
    ASSERT_EQ(kova_get_rptinfo_fromfile(b.path.c_str(), &r), KOVA_OK);
    EXPECT_EQ(r.len_ms[1], 0);
    Bytes f = b.with(4, "\x04\0\0\0");                  // type 4
    std::memcpy(f.data() + 76, "\x40\x42\x0f\x00", 4);  // 1000000 channels
    std::memcpy(f.data() + kRecord[0] + 32, "\2\0\0\0\0\0\0\0\xfb\xff\xff\xff\x3f\x42\x0f", 16);
    std::memcpy(f.data() + kRecord[2] + 24, "\xff\xff\xff\x7f", 4);  // INT32_MAX bytes
    const Probe p(b.path, f);
    ASSERT_EQ(p.rc, KOVA_OK);
    EXPECT_EQ(p.set->filters->count, 0u);
    EXPECT_EQ(memcmp(p.set->src[1]->pcm_proc, b.pcm[1].data(), 3000), 0);  // nothing filtered
    // Slot 2, repeat -5..999999 stored for the start source; 500 bytes held for the end one.
    // The stored slot field is kept (nothing indexes by it).
    const KOVA_SRC* start = p.set->src[0];
    EXPECT_TRUE(start->slot == 2 && start->rpt_start == 0 && start->rpt_end == 1000);
    EXPECT_EQ(p.set->src[2]->size, 500);
    // A negative size names no payload: the slot stays empty. Size 0 is an empty source.
    EXPECT_EQ(Probe(b.path, b.with(kRecord[0] + 24, "\xff\xff\xff\xff")).set->src[0], nullptr);
    const Probe empty(b.path, b.with(kRecord[0] + 24, "\0\0\0\0"));
    ASSERT_NE(empty.set->src[0], nullptr);
    EXPECT_EQ(empty.set->src[0]->size, 0);
    EXPECT_EQ(Probe(b.path, b.with(176, "\2\0\0\0")).set->src[1], nullptr);  // has_src 2: absent
    // Oversized payloads are cut at the slot limit and the next record is still found.
    save(make_set({}, tune(0, 0.4), make_src(0, pattern(50000, 4), 0, 50000),
                  make_src(1, pattern(300000, 5), 0, 300000), make_src(2, b.pcm[2], 0, 500)),
         b.path);
    const Probe big(b.path, read_file(b.path));
    ASSERT_EQ(big.rc, KOVA_OK);
    EXPECT_TRUE(big.set->src[0]->size == 38400 &&
                !memcmp(big.set->src[0]->pcm, pattern(38400, 4).data(), 38400));
    EXPECT_TRUE(big.set->src[1]->size == 192000 && big.set->src[1]->rpt_end == 192000);
    EXPECT_EQ(memcmp(big.set->src[2]->pcm, b.pcm[2].data(), 500), 0);
}

}  // namespace
