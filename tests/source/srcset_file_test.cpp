#include <cmath>

#include "kova/kova_dsp.h"
#include "source_fixture.h"

using namespace srcfix;

namespace {

struct Read {
    KOVA_SRCSET* set = prepared_set();
    int rc;
    explicit Read(const std::string& path) { rc = kova_open_source(set, path.c_str()); }
    ~Read() { kova_free_sourceset(set); }
};

// Two disabled filters, a start and a loop source, no end source.
KOVA_SRCSET* two_filter_set(const Bytes& start, const Bytes& loop, const KOVA_TUNE_SET& t) {
    return make_set({dsc(KOVA_FLT_BANDPASS, 1000.0), dsc(KOVA_FLT_LOWPASS, 3000.0)}, t,
                    make_src(0, start, 400, 1200), make_src(1, loop, 0, 4000), nullptr);
}

TEST(SrcsetFile, WriterLaysRecordsOutAtFixedOffsets) {
    TempDir t;
    const Bytes start = pattern(1200, 1), loop = pattern(4000, 2);
    KOVA_SRCSET* set = two_filter_set(start, loop, tune(0.5, 0.4));
    const int sum = save(set, t.file("s.kova"), 44100, 1);
    const Bytes f = read_file(t.file("s.kova"));
    const size_t n = 2;
    ASSERT_EQ(f.size(), 4 + 40 * n + 88 + 20 + 48 + 1200 + 48 + 4000);
    EXPECT_EQ(sum, static_cast<int>(f.size()));
    EXPECT_EQ(at<int32_t>(f, 0), 2);
    EXPECT_EQ(at<uint32_t>(f, 4), KOVA_FLT_BANDPASS);
    EXPECT_EQ(at<double>(f, 4 + 8), 1000.0);
    EXPECT_EQ(at<uint32_t>(f, 44), KOVA_FLT_LOWPASS);
    EXPECT_EQ(at<double>(f, 44 + 16), 100.0);
    EXPECT_EQ(at<int32_t>(f, 44 + 28), 48000);
    EXPECT_EQ(at<uint32_t>(f, 4 + 4) | at<uint32_t>(f, 4 + 36), 0u);  // padding is zero
    const size_t tune_at = 4 + 40 * n;
    EXPECT_EQ(at<double>(f, tune_at), 0.9);
    EXPECT_EQ(at<int32_t>(f, tune_at + 16), 1);
    EXPECT_EQ(at<uint32_t>(f, tune_at + 20) | at<uint32_t>(f, tune_at + 36), 0u);
    EXPECT_EQ(at<double>(f, tune_at + 48), 0.5);
    EXPECT_EQ(at<double>(f, tune_at + 56), 0.4);
    EXPECT_EQ(at<double>(f, tune_at + 80), 0.6);
    const size_t info_at = 92 + 40 * n;
    EXPECT_EQ(at<int32_t>(f, info_at), 1);
    EXPECT_EQ(at<int32_t>(f, info_at + 4), 1);
    EXPECT_EQ(at<int32_t>(f, info_at + 8), 0);
    EXPECT_EQ(at<int32_t>(f, info_at + 12), 44100);
    EXPECT_EQ(at<int32_t>(f, info_at + 16), 1);
    const size_t rec_at = 112 + 40 * n;
    EXPECT_EQ(Bytes(f.begin() + rec_at, f.begin() + rec_at + 24), Bytes(24, 0));
    EXPECT_EQ(at<int32_t>(f, rec_at + 24), 1200);
    EXPECT_EQ(at<int32_t>(f, rec_at + 28), 77);
    EXPECT_EQ(at<int32_t>(f, rec_at + 40), 400);
    EXPECT_EQ(at<int32_t>(f, rec_at + 44), 1200);
    // The payload is the unfiltered pcm, not the working copy.
    EXPECT_EQ(Bytes(f.begin() + 160 + 40 * n, f.begin() + 160 + 40 * n + 1200), start);
    const size_t loop_rec = 160 + 40 * n + 1200;
    EXPECT_EQ(at<int32_t>(f, loop_rec + 24), 4000);
    EXPECT_EQ(at<int32_t>(f, loop_rec + 32), 1);
    EXPECT_EQ(Bytes(f.begin() + loop_rec + 48, f.end()), loop);
    kova_free_sourceset(set);
}

TEST(SrcsetFile, RoundTripRestoresTheSetOverALongerOldFile) {
    TempDir t;
    const std::string p = t.file("r.kova");
    write_file(p, pattern(300000, 9));  // saving does not truncate; the tail must not matter
    const Bytes start = pattern(1200, 3), loop = pattern(4000, 4);
    KOVA_SRCSET* set = two_filter_set(start, loop, tune(0.5, 0.0));
    set->src[1]->origin = KOVA_ORIGIN_NOISE;
    save(set, p);
    Read r(p);
    ASSERT_EQ(r.rc, KOVA_OK);
    const auto got = filters_of(r.set), want = filters_of(set);
    ASSERT_EQ(got.size(), 2u);
    EXPECT_TRUE(same_dsc(got[0], want[0]) && same_dsc(got[1], want[1]));
    EXPECT_EQ(r.set->tune->file_gain, 0.5);  // a noise set keeps its level
    EXPECT_EQ(r.set->tune->wn_gain, 0.0);
    EXPECT_EQ(r.set->tune->sharpness, 0.25);
    EXPECT_EQ(r.set->src[2], nullptr);
    for (int slot = 0; slot < 2; ++slot) {
        const KOVA_SRC* a = set->src[slot];
        const KOVA_SRC* b = r.set->src[slot];
        ASSERT_NE(b, nullptr);
        EXPECT_EQ(b->size, a->size);
        EXPECT_EQ(b->slot, slot);
        EXPECT_EQ(b->rpt_start, a->rpt_start);
        EXPECT_EQ(b->rpt_end, a->rpt_end);
        EXPECT_EQ(b->pos, 0);
        EXPECT_EQ(b->origin, KOVA_ORIGIN_SAVEFILE);
        EXPECT_EQ(b->path, nullptr);
        EXPECT_EQ(std::memcmp(b->pcm, a->pcm, a->size), 0);
        EXPECT_EQ(std::memcmp(b->pcm_proc, a->pcm, a->size), 0);  // no enabled filter
    }
    kova_free_sourceset(set);
}

TEST(SrcsetFile, GainAdjustmentKeepsPositiveAndNanFileGain) {
    TempDir t;
    const struct {
        double wn, file, want_file;
    } cases[] = {{0.5, 0.4, 0.4}, {0.5, -1.0, 0.5}, {0.5, NAN, NAN}};
    for (const auto& c : cases) {
        KOVA_SRCSET* set =
            make_set({}, tune(c.wn, c.file), nullptr, make_src(1, pattern(8, 1), 0, 8), nullptr);
        save(set, t.file("g.kova"));
        kova_free_sourceset(set);
        Read r(t.file("g.kova"));
        ASSERT_EQ(r.rc, KOVA_OK);
        if (std::isnan(c.want_file)) {
            EXPECT_TRUE(std::isnan(r.set->tune->file_gain));
        } else {
            EXPECT_EQ(r.set->tune->file_gain, c.want_file);
        }
        EXPECT_EQ(r.set->tune->wn_gain, 0.0);
    }
}

TEST(SrcsetFile, EmptyStartSlotIsWrittenAndReadAsAbsent) {
    TempDir t;
    const Bytes loop = pattern(600, 5), end = pattern(300, 6);
    KOVA_SRCSET* set =
        make_set({}, tune(0, 0.4), nullptr, make_src(1, loop, 0, 600), make_src(2, end, 0, 300));
    save(set, t.file("e.kova"));
    kova_free_sourceset(set);
    const Bytes f = read_file(t.file("e.kova"));
    EXPECT_EQ(at<int32_t>(f, 92), 0);
    EXPECT_EQ(at<int32_t>(f, 96), 1);
    EXPECT_EQ(at<int32_t>(f, 112 + 24), 600);  // the loop record follows the info record
    Read r(t.file("e.kova"));
    ASSERT_EQ(r.rc, KOVA_OK);
    EXPECT_EQ(r.set->src[0], nullptr);
    ASSERT_NE(r.set->src[2], nullptr);
    EXPECT_EQ(std::memcmp(r.set->src[2]->pcm, end.data(), 300), 0);
}

TEST(SrcsetFile, EnabledFiltersRebuildTheWorkingCopy) {
    TempDir t;
    const Bytes loop = pattern(9600, 7);
    KOVA_SRCSET* set =
        make_set({dsc(KOVA_FLT_LOWPASS, 500.0, 1), dsc(KOVA_FLT_HIGHPASS, 2000.0, 1)}, tune(0, 0.4),
                 nullptr, make_src(1, loop, 0, 9600), nullptr);
    save(set, t.file("f.kova"));
    Read r(t.file("f.kova"));
    ASSERT_EQ(r.rc, KOVA_OK);
    Bytes expect = loop;  // the payload through the bank with the same filters
    kova_proc_filters(reinterpret_cast<int16_t*>(expect.data()), 9600, set->filters);
    ASSERT_NE(expect, loop);
    EXPECT_EQ(std::memcmp(r.set->src[1]->pcm, loop.data(), 9600), 0);
    EXPECT_EQ(std::memcmp(r.set->src[1]->pcm_proc, expect.data(), 9600), 0);
    kova_free_sourceset(set);
}

TEST(SrcsetFile, RefusalsLeaveTheSetAsGiven) {
    TempDir t;
    KOVA_SRCSET* set = two_filter_set(pattern(100, 1), pattern(200, 2), tune(0, 0.4));
    save(set, t.file("ok.kova"));
    kova_free_sourceset(set);
    EXPECT_EQ(kova_open_source(nullptr, t.file("ok.kova").c_str()), KOVA_ERR_INVALID_PARAM);
    Read missing(t.file("missing.kova"));
    Read too_long(t.file(std::string(600, 'x')));
    for (Read* r : {&missing, &too_long}) {
        EXPECT_EQ(r->rc, KOVA_ERR_INVALID_PARAM);
        EXPECT_EQ(r->set->filters->count, 0u);
        EXPECT_EQ(r->set->tune->file_gain, -7.0);  // the marker is still there
    }
    KOVA_SRCSET* busy = prepared_set();  // a set that already holds a source
    busy->src[2] = make_src(2, pattern(10, 3), 0, 10);
    EXPECT_EQ(kova_open_source(busy, t.file("ok.kova").c_str()), KOVA_ERR_INVALID_PARAM);
    EXPECT_EQ(busy->src[0], nullptr);
    EXPECT_EQ(busy->tune->file_gain, -7.0);
    kova_free_sourceset(busy);
}

TEST(SrcsetFile, EveryAllocationFailureIsReportedAndLeaksNothing) {
    TempDir t;
    KOVA_SRCSET* set = two_filter_set(pattern(100, 1), pattern(200, 2), tune(0, 0.4));
    set->src[2] = make_src(2, pattern(50, 3), 0, 50);
    save(set, t.file("a.kova"));
    kova_free_sourceset(set);
    int successes = 0;
    for (long k = 0; successes == 0 && k < 100; ++k) {
        const size_t before = heap_in_use();
        KOVA_SRCSET* s = prepared_set();
        kova_mem_fail_after(k);
        const int rc = kova_open_source(s, t.file("a.kova").c_str());
        kova_mem_fail_after(-1);
        if (rc == KOVA_OK) {
            ++successes;
            EXPECT_NE(s->src[2], nullptr);
        } else {
            // The access object's buffer and handle fail as "cannot open", the rest as memory.
            EXPECT_EQ(rc, k < 2 ? KOVA_ERR_INVALID_PARAM : KOVA_ERR_INSUFF_MEM) << k;
        }
        kova_free_sourceset(s);
        EXPECT_TRUE(heap_back_to(before)) << k;
    }
    EXPECT_EQ(successes, 1);
}

}  // namespace
