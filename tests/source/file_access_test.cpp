#include <sys/stat.h>

#include "source_fixture.h"

using namespace srcfix;

namespace {

// A path of exactly `len` characters inside `dir` (directories of up to 200 characters).
std::string path_of_length(const TempDir& t, size_t len) {
    std::string p = t.dir.string();
    while (p.size() + 1 + 200 < len - 10) {
        p += "/" + std::string(200, 'd');
        std::filesystem::create_directory(p);
    }
    p += "/";
    return p + std::string(len - p.size(), 'f');
}

struct Opened {
    TARQ_MFAL m{};
    void* h = nullptr;
    Opened(const std::string& path, int mode) {
        EXPECT_EQ(tarq_mfal_init(path.c_str(), &m), 0);
        h = m.open(&m, mode);
    }
    ~Opened() {
        if (h) m.close(h);
        kova_mem_free(m.path);
    }
    int64_t pos() {
        int64_t p = -99;
        EXPECT_EQ(m.getpos(h, &p), 0);
        return p;
    }
};

TEST(FileAccess, PathLengthLimitAt512) {
    TempDir t;
    const std::string ok = path_of_length(t, 511), too_long = ok + "g";
    ASSERT_EQ(ok.size(), 511u);
    write_file(ok, pattern(10, 1));
    {
        Opened f(ok, 0);
        ASSERT_NE(f.h, nullptr);
        EXPECT_STREQ(f.m.path, ok.c_str());
        char buf[10];
        EXPECT_EQ(f.m.read(f.h, buf, 10), 10);
    }
    TARQ_MFAL m;
    EXPECT_EQ(tarq_mfal_init(too_long.c_str(), &m), -1);
    kova_mem_free(m.path);  // the caller owns the buffer whatever the result
    EXPECT_EQ(tarq_mfal_init(ok.c_str(), nullptr), -1);
    kova_mem_fail_after(0);
    EXPECT_EQ(tarq_mfal_init(ok.c_str(), &m), -1);
    kova_mem_fail_after(-1);
    EXPECT_EQ(m.path, nullptr);
}

TEST(FileAccess, PositionsSkipAndSize) {
    TempDir t;
    const std::string p = t.file("a.bin");
    const Bytes data = pattern(1000, 2);
    write_file(p, data);
    Opened f(p, 0);
    ASSERT_NE(f.h, nullptr);
    int64_t size = 0;
    EXPECT_EQ(f.m.getsize(f.h, &size), 0);
    EXPECT_EQ(size, 1000);
    EXPECT_EQ(f.pos(), 0);  // getsize put the position back

    const int64_t to = 400, zero = 0, neg = -3, fwd = 250;
    EXPECT_EQ(f.m.setpos(f.h, &to), 0);
    EXPECT_EQ(f.m.getsize(f.h, &size), 0);
    EXPECT_EQ(f.pos(), 400);
    EXPECT_EQ(f.m.skip(f.h, &zero), -1);
    EXPECT_EQ(f.m.skip(f.h, &neg), -1);
    EXPECT_EQ(f.pos(), 400);
    EXPECT_EQ(f.m.skip(f.h, &fwd), 0);
    uint8_t b = 0;
    EXPECT_EQ(f.m.read(f.h, &b, 1), 1);
    EXPECT_EQ(b, data[650]);
    EXPECT_EQ(f.m.read(f.h, &b, -1), -1);
    EXPECT_EQ(f.m.setpos(f.h, &neg), -1);
    // Read-only: a write fails whatever other mode bits say.
    EXPECT_EQ(f.m.write(f.h, &b, 1), -1);
}

TEST(FileAccess, WriteOpenCreatesWith0644AndNeverTruncates) {
    TempDir t;
    const mode_t old = umask(022);
    const std::string fresh = t.file("new.bin"), old_file = t.file("old.bin");
    {
        Opened f(fresh, 1);
        ASSERT_NE(f.h, nullptr);
        EXPECT_EQ(f.m.write(f.h, "xyz", 3), 3);
    }
    struct stat st {};
    ASSERT_EQ(stat(fresh.c_str(), &st), 0);
    EXPECT_EQ(st.st_mode & 0777, 0644u);
    umask(old);

    write_file(old_file, Bytes{'A', 'B', 'C', 'D', 'E', 'F'});
    {
        Opened f(old_file, 3);  // bit 0 set: read-write
        ASSERT_NE(f.h, nullptr);
        EXPECT_EQ(f.m.write(f.h, "xy", 2), 2);
    }
    EXPECT_EQ(read_file(old_file), (Bytes{'x', 'y', 'C', 'D', 'E', 'F'}));

    Opened missing(t.file("none.bin"), 0);
    EXPECT_EQ(missing.h, nullptr);
}

TEST(FileAccess, CloseOfEmptyHandleOnlyFreesIt) {
    TARQ_MFAL m;
    ASSERT_EQ(tarq_mfal_init("unused", &m), 0);
    const size_t before = heap_in_use();
    auto* cell = static_cast<int32_t*>(kova_mem_malloc(sizeof(int32_t)));
    *cell = -1;
    const size_t with_cell = heap_in_use();
    m.close(cell);
    const size_t after = heap_in_use();
    kova_mem_free(m.path);
    if (!kHeapProbe) GTEST_SKIP() << "exact heap counts need the sanitizer allocator";
    EXPECT_EQ(with_cell, before + sizeof(int32_t));  // the probe sees the cell
    EXPECT_EQ(after, before);
}

}  // namespace
