// SPDX-License-Identifier: Apache-2.0
// The file-access layer every file of the library goes through.
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstring>
#include <filesystem>
#include <fstream>

#include "kova/kova_source.h"
#include "support/temp_dir.h"
#include "util/kova_mem.h"

namespace {

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

TEST(FileAccess, PathLimitPositionsAndSize) {
    kova_test::TempDir t;
    const std::string dir = t.file(std::string(250, 'd'));
    std::filesystem::create_directory(dir);
    const std::string path = dir + "/" + std::string(511 - dir.size() - 1, 'f');  // 511 chars
    std::string data(1000, '\0');
    for (size_t i = 0; i < data.size(); ++i) data[i] = static_cast<char>(i * 31 + (i >> 8));
    std::ofstream(path) << data;
    std::ofstream(path + "g") << data;
    EXPECT_EQ(Opened(path + "g", 0).h, nullptr);  // 512 characters: refused though it exists
    EXPECT_EQ(Opened(t.file("missing"), 0).h, nullptr);
    Opened f(path, 2);  // bit 0 clear: read-only
    ASSERT_NE(f.h, nullptr);
    int64_t size = 0, pos = -1, to = 400, zero = 0, neg = -3, fwd = 250;
    EXPECT_EQ(f.m.setpos(f.h, &to) + f.m.getsize(f.h, &size) + f.m.getpos(f.h, &pos), 0);
    EXPECT_EQ(size, 1000);
    EXPECT_EQ(pos, 400);  // getsize put the position back
    EXPECT_EQ(f.m.skip(f.h, &zero) + f.m.skip(f.h, &neg) + f.m.setpos(f.h, &neg), -3);
    EXPECT_EQ(f.m.skip(f.h, &fwd), 0);  // the refused moves left the position at 400
    char b = 0;
    EXPECT_EQ(f.m.read(f.h, &b, 1), 1);
    EXPECT_EQ(b, data[650]);
    EXPECT_EQ(f.m.write(f.h, &b, 1), -1);
}

TEST(FileAccess, WriteOpenCreates0644AndKeepsTheOldTail) {
    kova_test::TempDir t;
    const mode_t old = umask(022);
    EXPECT_NE(Opened(t.file("new"), 1).h, nullptr);
    umask(old);
    struct stat st {};
    ASSERT_EQ(stat(t.file("new").c_str(), &st), 0);
    EXPECT_EQ(st.st_mode & 0777, 0644u);
    std::ofstream(t.file("old")) << "ABCD";
    {
        Opened f(t.file("old"), 1);
        EXPECT_EQ(f.m.write(f.h, "xy", 2), 2);
        // A handle holding no descriptor is only freed (the leak checker sees the rest).
        f.m.close(std::memset(kova_mem_malloc(4), 0xFF, 4));
    }
    std::ifstream in(t.file("old"));
    EXPECT_EQ(std::string(std::istreambuf_iterator<char>(in), {}), "xyCD");
}

}  // namespace
