#include <fcntl.h>

#include <random>

#include "source_fixture.h"

using namespace srcfix;

namespace {

// Base file: two enabled filters, sources of 1000, 3000 and 500 bytes in slots 0, 1, 2.
constexpr int32_t kSizes[3] = {1000, 3000, 500};
constexpr size_t kRecord[3] = {192, 192 + 48 + 1000, 192 + 96 + 4000};  // record offsets

struct Base {
    TempDir t;
    Bytes pcm[3] = {pattern(1000, 1), pattern(3000, 2), pattern(500, 3)};
    Bytes file;
    std::string path = t.file("h.kova");
    Base() {
        KOVA_SRCSET* set =
            make_set({dsc(KOVA_FLT_BANDPASS, 1000.0, 1), dsc(KOVA_FLT_LOWPASS, 3000.0, 1)},
                     tune(0, 0.4), make_src(0, pcm[0], 100, 1000), make_src(1, pcm[1], 0, 3000),
                     make_src(2, pcm[2], 0, 500));
        save(set, path);
        kova_free_sourceset(set);
        file = read_file(path);
    }
    template <typename T>
    Bytes with(size_t off, T value) const {
        Bytes b = file;
        std::memcpy(b.data() + off, &value, sizeof value);
        return b;
    }
};

// What any set read from any file must satisfy for the engine to use it safely.
void expect_sane(const KOVA_SRCSET* set) {
    EXPECT_LE(set->filters->count, 64u);
    for (const KOVA_FLT_DSC& d : filters_of(set)) {
        EXPECT_LT(d.type, 4u);
        EXPECT_TRUE(d.channels == 1 || d.channels == 2);
    }
    const int32_t limit[3] = {38400, 192000, 38400};
    for (int slot = 0; slot < 3; ++slot) {
        const KOVA_SRC* s = set->src[slot];
        if (s == nullptr) continue;
        EXPECT_TRUE(s->pcm && s->pcm_proc && !s->path);
        EXPECT_GT(s->size, 0);
        EXPECT_LE(s->size, limit[slot]);
        EXPECT_EQ(s->slot, slot);
        EXPECT_EQ(s->pos, 0);
        EXPECT_TRUE(s->rpt_start >= 0 && s->rpt_start <= s->size);
        EXPECT_TRUE(s->rpt_end >= 0 && s->rpt_end <= s->size);
    }
}

// Sends standard output to /dev/null while alive (cheaper than capturing thousands of times).
struct Quiet {
    int saved;
    Quiet() {
        fflush(stdout);
        saved = dup(1);
        const int null_fd = open("/dev/null", O_WRONLY);
        dup2(null_fd, 1);
        close(null_fd);
    }
    ~Quiet() {
        fflush(stdout);
        dup2(saved, 1);
        close(saved);
    }
};

// Reads `bytes` as a set and through every query; returns the set reader's result.
int probe(const std::string& path, const Bytes& bytes, KOVA_SRCSET** keep = nullptr) {
    write_file(path, bytes);
    KOVA_SRCSET* set = prepared_set();
    const int rc = kova_open_source(set, path.c_str());
    EXPECT_TRUE(rc == KOVA_OK || rc == KOVA_ERR_INVALID_PARAM) << rc;
    expect_sane(set);
    int o[6];
    KOVA_FLT_DSC f[4];
    KOVA_TUNE_SET tn{};
    KOVA_RPT_INFO r{};
    testing::internal::CaptureStdout();
    const int q[4] = {
        kova_get_pcminfo_fromfile(path.c_str(), &o[0], &o[1], &o[2], &o[3], &o[4], &o[5]),
        kova_get_filters_fromfile(path.c_str(), f), kova_get_tuneset_fromfile(path.c_str(), &tn),
        kova_get_rptinfo_fromfile(path.c_str(), &r)};
    testing::internal::GetCapturedStdout();
    for (int v : q) EXPECT_EQ(v, rc);  // the queries accept exactly the files the reader does
    if (keep) {
        *keep = set;
    } else {
        kova_free_sourceset(set);
    }
    return rc;
}

TEST(HostileFile, EveryTruncationReadsWhatIsThereAndNothingElse) {
    Base b;
    for (size_t len = 0; len <= b.file.size(); ++len) {
        SCOPED_TRACE(len);
        KOVA_SRCSET* set = nullptr;
        ASSERT_EQ(probe(b.path, Bytes(b.file.begin(), b.file.begin() + len), &set), KOVA_OK);
        const size_t whole_filters = len < 4 ? 0 : std::min<size_t>(2, (len - 4) / 40);
        EXPECT_EQ(set->filters->count, whole_filters);
        // end_gain is stored at 164..171; what the file does not hold is cleared.
        if (len <= 164 || len >= 172) {
            EXPECT_EQ(set->tune->end_gain, len >= 172 ? 0.6 : 0.0);
        }
        for (int slot = 0; slot < 3; ++slot) {
            const size_t payload = kRecord[slot] + 48;
            const KOVA_SRC* s = set->src[slot];
            if (len <= payload) {
                EXPECT_EQ(s, nullptr) << slot;
                continue;
            }
            ASSERT_NE(s, nullptr) << slot;
            const auto kept = static_cast<int32_t>(std::min<size_t>(kSizes[slot], len - payload));
            EXPECT_EQ(s->size, kept);
            EXPECT_EQ(std::memcmp(s->pcm, b.pcm[slot].data(), kept), 0);
        }
        kova_free_sourceset(set);
    }
}

TEST(HostileFile, StoredCountsAboveTheLimitRefuseTheFileUntouched) {
    Base b;
    for (int32_t count : {65, INT32_MAX}) {
        write_file(b.path, b.with<int32_t>(0, count));
        KOVA_SRCSET* set = prepared_set();
        EXPECT_EQ(kova_open_source(set, b.path.c_str()), KOVA_ERR_INVALID_PARAM);
        EXPECT_EQ(set->filters->count, 0u);
        EXPECT_EQ(set->tune->file_gain, -7.0);
        EXPECT_TRUE(!set->src[0] && !set->src[1] && !set->src[2]);
        kova_free_sourceset(set);
        EXPECT_EQ(probe(b.path, b.with<int32_t>(0, count)), KOVA_ERR_INVALID_PARAM);
    }
    // Counts that are merely wrong read on safely.
    for (int32_t count : {64, 3, -5, INT32_MIN})
        EXPECT_EQ(probe(b.path, b.with<int32_t>(0, count)), KOVA_OK);
}

TEST(HostileFile, UnusableDescriptorsAreDropped) {
    Base b;
    Bytes f = b.with<uint32_t>(4, 4u);                       // first descriptor: type 4
    std::memcpy(f.data() + 44 + 32, "\x40\x42\x0f\x00", 4);  // second: 1000000 channels
    KOVA_SRCSET* set = nullptr;
    ASSERT_EQ(probe(b.path, f, &set), KOVA_OK);
    EXPECT_EQ(set->filters->count, 0u);
    EXPECT_EQ(std::memcmp(set->src[1]->pcm_proc, b.pcm[1].data(), 3000), 0);  // nothing filters
    kova_free_sourceset(set);
    EXPECT_EQ(probe(b.path, b.with<uint32_t>(4, 0xFFFFFFFFu)), KOVA_OK);
}

TEST(HostileFile, StoredSizesSlotsAndRepeatPointsAreBounded) {
    Base b;
    KOVA_SRCSET* set = nullptr;
    // Oversized payloads are cut at the slot limit and the next record is still found.
    KOVA_SRCSET* big =
        make_set({}, tune(0, 0.4), make_src(0, pattern(50000, 4), 0, 50000),
                 make_src(1, pattern(300000, 5), 0, 300000), make_src(2, b.pcm[2], 0, 500));
    save(big, b.path);
    ASSERT_EQ(probe(b.path, read_file(b.path), &set), KOVA_OK);
    EXPECT_EQ(set->src[0]->size, 38400);
    EXPECT_EQ(std::memcmp(set->src[0]->pcm, big->src[0]->pcm, 38400), 0);
    EXPECT_EQ(set->src[1]->size, 192000);
    EXPECT_EQ(set->src[1]->rpt_end, 192000);
    ASSERT_NE(set->src[2], nullptr);
    EXPECT_EQ(std::memcmp(set->src[2]->pcm, b.pcm[2].data(), 500), 0);
    kova_free_sourceset(set);
    kova_free_sourceset(big);

    const size_t r0 = kRecord[0], r2 = kRecord[2];
    for (int32_t size : {-1, 0}) {
        ASSERT_EQ(probe(b.path, b.with<int32_t>(r0 + 24, size), &set), KOVA_OK);
        EXPECT_EQ(set->src[0], nullptr);
        kova_free_sourceset(set);
    }
    ASSERT_EQ(probe(b.path, b.with<int32_t>(r2 + 24, INT32_MAX), &set), KOVA_OK);
    EXPECT_EQ(set->src[2]->size, 500);  // cut to the bytes the file holds
    kova_free_sourceset(set);

    Bytes f = b.with<int32_t>(r0 + 32, 2);  // slot field disagrees with the position
    std::memcpy(f.data() + r0 + 40, "\xfb\xff\xff\xff\x3f\x42\x0f\x00", 8);  // -5, 999999
    ASSERT_EQ(probe(b.path, f, &set), KOVA_OK);
    EXPECT_EQ(set->src[0]->slot, 0);
    EXPECT_EQ(set->src[0]->rpt_start, 0);
    EXPECT_EQ(set->src[0]->rpt_end, 1000);
    kova_free_sourceset(set);

    ASSERT_EQ(probe(b.path, b.with<int32_t>(172 + 4, 2), &set), KOVA_OK);  // has_src 2: absent
    EXPECT_EQ(set->src[1], nullptr);
    kova_free_sourceset(set);
}

TEST(HostileFile, QueriesStayWithinRangeOnBadValues) {
    Base b;
    write_file(b.path, b.with<int32_t>(172 + 12, 0));  // stored sample rate 0
    KOVA_RPT_INFO r{};
    ASSERT_EQ(kova_get_rptinfo_fromfile(b.path.c_str(), &r), KOVA_OK);
    EXPECT_EQ(r.len_ms[1], 15);  // 3000 bytes at the default 48000 Hz stereo

    write_file(b.path, b.with<int32_t>(kRecord[0] + 24, INT32_MAX));
    int o[6] = {-7, -7, -7, -7, -7, -7};
    ASSERT_EQ(kova_get_pcminfo_fromfile(b.path.c_str(), &o[0], &o[1], &o[2], &o[3], &o[4], &o[5]),
              KOVA_OK);
    EXPECT_EQ(o[0], 240);
    EXPECT_EQ(o[1], INT32_MAX);
    EXPECT_EQ(o[2], -7);  // no 32-bit offset exists past the huge payload
}

TEST(HostileFile, RandomAndMutatedFilesAreReadSafely) {
    Base b;
    std::mt19937 rng(20240611);
    for (int i = 0; i < 300; ++i) {
        Bytes f;
        if (i % 2 == 0) {
            f.resize(rng() % 700);
            for (auto& x : f) x = static_cast<uint8_t>(rng());
        } else {
            f = b.file;
            for (int k = 1 + rng() % 8; k > 0; --k) f[rng() % 300] = static_cast<uint8_t>(rng());
            f.resize(rng() % (f.size() + 1));
        }
        SCOPED_TRACE(i);
        probe(b.path, f);
    }
}

}  // namespace
