#include "source_fixture.h"

using namespace srcfix;

namespace {

struct Loaded {
    KOVA_SRC* src;
    int err;
    Loaded(const std::string& path, int slot) : err(12345) {
        src = kova_load_sound_source(path.c_str(), slot, &err);
    }
    ~Loaded() { kova_free_sourceobj(src); }
};

// The loaded record holds the file's first `n` bytes, twice, and the loader's defaults.
void expect_source(const Loaded& l, const Bytes& file, int slot, int32_t n,
                   const std::string& path) {
    ASSERT_NE(l.src, nullptr);
    EXPECT_EQ(l.err, KOVA_OK);
    EXPECT_EQ(l.src->size, n);
    EXPECT_EQ(l.src->rpt_end, n);
    EXPECT_EQ(l.src->rpt_start, 0);
    EXPECT_EQ(l.src->pos, 0);
    EXPECT_EQ(l.src->slot, slot);
    EXPECT_EQ(l.src->origin, KOVA_ORIGIN_FILE);
    EXPECT_STREQ(l.src->path, path.c_str());
    EXPECT_EQ(std::memcmp(l.src->pcm, file.data(), n), 0);
    EXPECT_EQ(std::memcmp(l.src->pcm_proc, file.data(), n), 0);
}

TEST(PcmLoader, SlotLimitsCutLongFiles) {
    TempDir t;
    const std::string f50k = t.file("50k.pcm"), f300k = t.file("300k.pcm"), f45 = t.file("45.pcm");
    const Bytes b50k = pattern(50000, 3), b300k = pattern(300000, 4), b45 = pattern(45, 5);
    write_file(f50k, b50k);
    write_file(f300k, b300k);
    write_file(f45, b45);
    expect_source(Loaded(f50k, 0), b50k, 0, 38400, f50k);
    expect_source(Loaded(f50k, 2), b50k, 2, 38400, f50k);
    expect_source(Loaded(f50k, 1), b50k, 1, 50000, f50k);
    expect_source(Loaded(f300k, 1), b300k, 1, 192000, f300k);
    expect_source(Loaded(f45, 0), b45, 0, 45, f45);  // odd length, nothing skipped
}

TEST(PcmLoader, UnusableInputFailsWithSourceError) {
    TempDir t;
    const std::string empty = t.file("empty.pcm"), ok = t.file("ok.pcm");
    write_file(empty, {});
    write_file(ok, pattern(100, 6));
    for (const auto& [path, slot] :
         std::vector<std::pair<std::string, int>>{{empty, 1},
                                                  {ok, 3},
                                                  {ok, -1},
                                                  {t.file("missing.pcm"), 1},
                                                  {ok + std::string(600, 'x'), 1}}) {
        Loaded l(path, slot);
        EXPECT_EQ(l.src, nullptr) << path.size() << " slot " << slot;
        EXPECT_EQ(l.err, KOVA_ERR_SOURCE);
    }
    int err = 0;
    EXPECT_EQ(kova_load_sound_source(nullptr, 1, &err), nullptr);
    EXPECT_EQ(err, KOVA_ERR_SOURCE);
}

TEST(PcmLoader, AllocationFailuresReportNoMemoryAndLeakNothing) {
    TempDir t;
    const std::string p = t.file("a.pcm");
    write_file(p, pattern(2000, 7));
    // The access object's buffer and handle come first (their failure is an unusable file),
    // then the record, its path and the two sample buffers.
    const int expected[] = {KOVA_ERR_SOURCE,     KOVA_ERR_SOURCE,     KOVA_ERR_INSUFF_MEM,
                            KOVA_ERR_INSUFF_MEM, KOVA_ERR_INSUFF_MEM, KOVA_ERR_INSUFF_MEM};
    for (int k = 0; k <= 6; ++k) {
        const size_t before = heap_in_use();
        int err = 99;
        kova_mem_fail_after(k);
        KOVA_SRC* s = kova_load_sound_source(p.c_str(), 1, &err);
        kova_mem_fail_after(-1);
        if (k < 6) {
            EXPECT_EQ(s, nullptr) << k;
            EXPECT_EQ(err, expected[k]) << k;
            EXPECT_TRUE(heap_back_to(before)) << k;
        } else {
            ASSERT_NE(s, nullptr);
            EXPECT_EQ(s->size, 2000);
        }
        kova_free_sourceobj(s);
        EXPECT_TRUE(heap_back_to(before));
    }
}

TEST(PcmLoader, ReadSourceFileIsBoundedByCapacityAndFile) {
    TempDir t;
    const std::string p = t.file("k.pcm");
    const Bytes data = pattern(1000, 8);
    write_file(p, data);
    Bytes buf(5000, 0xEE);
    EXPECT_EQ(kova_read_source_file(p.c_str(), buf.data(), 100), 100);
    EXPECT_EQ(std::memcmp(buf.data(), data.data(), 100), 0);
    EXPECT_EQ(buf[100], 0xEE);
    EXPECT_EQ(kova_read_source_file(p.c_str(), buf.data(), 5000), 1000);
    EXPECT_EQ(std::memcmp(buf.data(), data.data(), 1000), 0);
    EXPECT_EQ(buf[1000], 0xEE);

    Bytes untouched(16, 0xEE);
    EXPECT_EQ(kova_read_source_file(t.file("missing").c_str(), untouched.data(), 16), 0);
    EXPECT_EQ(kova_read_source_file(p.c_str(), untouched.data(), -1), 0);
    EXPECT_EQ(kova_read_source_file(p.c_str(), nullptr, 16), 0);
    EXPECT_EQ(kova_read_source_file(nullptr, untouched.data(), 16), 0);
    EXPECT_EQ(untouched, Bytes(16, 0xEE));
}

}  // namespace
