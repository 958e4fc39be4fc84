// SPDX-License-Identifier: Apache-2.0
#include "source_fixture.h"

namespace {

TEST(PcmLoader, SlotLimitsAndUnusableInput) {
    TempDir t;
    const struct {
        size_t file;
        int slot;
        int32_t size;
    } ok[] = {
        {50000, 0, 38400}, {50000, 2, 38400}, {50000, 1, 50000}, {300000, 1, 192000}, {45, 0, 45}};
    for (const auto& c : ok) {
        const Bytes data = pattern(c.file, c.slot);
        write_file(t.file("f"), data);
        int err = 99;
        KOVA_SRC* s = kova_load_sound_source(t.file("f").c_str(), c.slot, &err);
        ASSERT_NE(s, nullptr);
        EXPECT_EQ(err, KOVA_OK);
        EXPECT_TRUE(s->size == c.size && s->rpt_end == c.size && s->rpt_start == 0 && s->pos == 0);
        EXPECT_TRUE(s->slot == c.slot && s->origin == KOVA_ORIGIN_FILE);
        EXPECT_EQ(s->path, t.file("f"));
        EXPECT_EQ(std::memcmp(s->pcm, data.data(), c.size), 0);  // from the very first byte
        EXPECT_EQ(std::memcmp(s->pcm_proc, data.data(), c.size), 0);
        kova_free_sourceobj(s);
    }
    write_file(t.file("empty"), {});
    const std::pair<std::string, int> bad[] = {
        {"empty", 1}, {"f", 3}, {"f", -1}, {"missing", 1}, {std::string(600, 'x'), 1}};
    for (const auto& [name, slot] : bad) {
        int err = 99;
        EXPECT_EQ(kova_load_sound_source(t.file(name).c_str(), slot, &err), nullptr);
        EXPECT_EQ(err, KOVA_ERR_SOURCE) << name.size() << " " << slot;
    }
}

TEST(PcmLoader, ReadSourceFileIsBoundedByCapacityAndFile) {
    TempDir t;
    const Bytes data = pattern(1000, 8);
    write_file(t.file("k"), data);
    const std::string path = t.file("k");
    const char* k = path.c_str();
    Bytes buf(2000, 0xEE);
    EXPECT_EQ(kova_read_source_file(k, buf.data(), 100), 100);
    EXPECT_EQ(buf[100], 0xEE);
    EXPECT_EQ(kova_read_source_file(k, buf.data(), 2000), 1000);
    EXPECT_EQ(Bytes(buf.begin(), buf.begin() + 1000), data);
    EXPECT_EQ(buf[1000], 0xEE);
}

}  // namespace
