// SPDX-License-Identifier: Apache-2.0
// Source-set files are portable between the machines the library runs on: a file written on
// x86-64 reads back on AArch64 exactly as on the machine that wrote it, and the other way round.
//
// Each run builds the same set through the engine, saves it as srcset-ARCH.kss in the exchange
// directory (KOVA_XARCH_DIR; a fresh temporary directory when unset) and checks the bytes against
// an image encoded here field by field in little-endian order. It then reads every srcset-*.kss
// found there, whichever machine wrote it, checks that it saves again to the same image, and
// compares the sound a fixed stroke produces from it with gen-*.pcm of other machines.
// scripts/aarch64.sh runs this test natively, then under qemu-aarch64, then natively again, so
// each machine reads the other's file, and compares the files of both machines byte for byte.
#include <gtest/gtest.h>

#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <string>
#include <vector>

#include "kova/kova.h"
#include "support/temp_dir.h"

namespace {

#if defined(__x86_64__)
constexpr const char* kArch = "x86_64";
#elif defined(__aarch64__)
constexpr const char* kArch = "aarch64";
#else
constexpr const char* kArch = "other";
#endif

using Bytes = std::vector<uint8_t>;

const KOVA_FORMAT kFormat{48000, 2, 1, 1080, 2280};
const KOVA_FLT_DSC kFilters[2] = {{KOVA_FLT_LOWPASS, 3000.0, 0.75, 1, 48000, 2},
                                  {KOVA_FLT_BANDPASS, 1250.5, 0.5, 1, 48000, 2}};
// Binary fractions, so every value is exact in any representation the code might pass through.
const KOVA_TUNE_SET kTune{0.75, 0.25, 1, 0.5, 1, 0.125, 0.0, 0.625, 0.5, 0.875, 0.375};
constexpr int32_t kSizes[3] = {3840, 19200, 1922};  // 20 ms, 100 ms, 10.01 ms
constexpr int32_t kLoopRepeatMs[2] = {10, 90};      // stored as 1920 and 17280 bytes

Bytes pcm(int slot) {
    Bytes out(static_cast<size_t>(kSizes[slot]));
    uint32_t x = 0x9E3779B9u * static_cast<uint32_t>(slot + 1);
    for (uint8_t& v : out) {
        x = x * 1664525u + 1013904223u;
        v = static_cast<uint8_t>(x >> 24);
    }
    return out;
}

// Little-endian encoders, independent of the host's byte order and struct layout.
void put(Bytes& b, uint64_t v, int bytes) {
    for (int i = 0; i < bytes; ++i) b.push_back(i < 8 ? static_cast<uint8_t>(v >> (8 * i)) : 0);
}
void put_i32(Bytes& b, int32_t v) {
    put(b, static_cast<uint32_t>(v), 4);
}
void put_f64(Bytes& b, double d) {
    uint64_t v;
    std::memcpy(&v, &d, 8);
    put(b, v, 8);
}

// The file a set saved on any machine must be, byte for byte. Reference words and padding are
// written as zeros; `origin` is 1 for sources loaded from PCM files, 2 once read from a file.
Bytes expected_file(int32_t origin) {
    Bytes b;
    put_i32(b, 2);
    for (const KOVA_FLT_DSC& d : kFilters) {
        put(b, d.type, 8);  // and 4 bytes of padding
        put_f64(b, d.freq);
        put_f64(b, d.bandwidth);
        for (int32_t v : {static_cast<int32_t>(d.enable), d.samplerate, d.channels}) put_i32(b, v);
        put(b, 0, 4);
    }
    const KOVA_TUNE_SET& t = kTune;
    put_f64(b, t.gain);
    put_f64(b, t.pan);
    put(b, t.osc_enable, 8);  // and padding
    put_f64(b, t.osc_depth);
    put(b, t.sharp_enable, 8);
    for (double v : {t.sharpness, t.wn_gain, t.file_gain, t.start_gain, t.loop_gain, t.end_gain})
        put_f64(b, v);
    for (int32_t v : {1, 1, 1, 48000, 2}) put_i32(b, v);
    for (int slot = 0; slot < 3; ++slot) {
        const bool loop = slot == KOVA_SLOT_LOOP;
        put(b, 0, 24);
        for (int32_t v :
             {kSizes[slot], 0 /* play position */, slot, origin, loop ? kLoopRepeatMs[0] * 192 : 0,
              loop ? kLoopRepeatMs[1] * 192 : kSizes[slot]})
            put_i32(b, v);
        const Bytes samples = pcm(slot);
        b.insert(b.end(), samples.begin(), samples.end());
    }
    return b;
}

const auto read_file = kova_test::read_file<Bytes>;

class CrossArch : public testing::Test {
   protected:
    // Builds the set through the engine in a context of its own and saves it as this machine's
    // file: PCM files, two filters, a tune set and loop repeat points.
    void SetUp() override {
        const char* env = std::getenv("KOVA_XARCH_DIR");
        dir_ = env != nullptr && *env != '\0' ? env : own_dir_.path;
        std::filesystem::create_directories(dir_);
        int32_t err = 0;
        ctx_ = kova_init(&kFormat, &err);
        ASSERT_NE(ctx_, nullptr);
        const std::string paths[3] = {own_dir_.write("0.pcm", pcm(0)),
                                      own_dir_.write("1.pcm", pcm(1)),
                                      own_dir_.write("2.pcm", pcm(2))};
        const char* cpaths[3] = {paths[0].c_str(), paths[1].c_str(), paths[2].c_str()};
        ASSERT_EQ(kova_reg_src_byfiles(ctx_, cpaths, &err), 1);
        for (const KOVA_FLT_DSC& d : kFilters) EXPECT_EQ(kova_attach_filter(ctx_, 1, &d, &err), 1);
        EXPECT_EQ(kova_set_tuneset(ctx_, 1, &kTune), KOVA_OK);
        KOVA_RPT_INFO rpt{{0, 0, 0}, {-1, kLoopRepeatMs[0], -1}, {-1, kLoopRepeatMs[1], -1}};
        EXPECT_EQ(kova_set_rptinfo(ctx_, 1, &rpt), KOVA_OK);
        std::remove(own_file().c_str());  // saving does not truncate
        EXPECT_EQ(kova_save_source(ctx_, 1, own_file().c_str()),
                  static_cast<int32_t>(expected_file(KOVA_ORIGIN_FILE).size()));
        ASSERT_EQ(kova_deinit(ctx_), KOVA_OK);
        ctx_ = kova_init(&kFormat, &err);
        ASSERT_NE(ctx_, nullptr);
    }
    void TearDown() override {
        if (ctx_ != nullptr) kova_deinit(ctx_);
    }

    std::string own_file() const { return dir_ + "/srcset-" + kArch + ".kss"; }

    // Files of the exchange directory named PREFIX*SUFFIX.
    std::vector<std::string> files(const std::string& prefix, const std::string& suffix) const {
        std::vector<std::string> out;
        for (const auto& e : std::filesystem::directory_iterator(dir_)) {
            const std::string name = e.path().filename().string();
            if (name.starts_with(prefix) && name.ends_with(suffix)) out.push_back(e.path());
        }
        return out;
    }

    kova_test::TempDir own_dir_;
    std::string dir_;
    KOVA_CTX* ctx_ = nullptr;
};

// Every machine's file, this one's included, is the little-endian image and reads back to the
// same set: saved again, it is the image once more. (With the bytes equal everywhere, the file
// queries and repeat points are those the source suites check on each machine.)
TEST_F(CrossArch, FilesFromEveryMachineAreTheImageAndReadTheSame) {
    const Bytes expected = expected_file(KOVA_ORIGIN_FILE);
    const std::vector<std::string> sets = files("srcset-", ".kss");
    ASSERT_FALSE(sets.empty());
    for (const std::string& path : sets) {
        SCOPED_TRACE(path);
        EXPECT_TRUE(read_file(path) == expected);

        int32_t err = 0;
        const int32_t id = kova_reg_src_bysavefile(ctx_, path.c_str(), &err);
        ASSERT_GE(id, 1) << err;
        // Saved again here, it is the same file with every source now marked as read back.
        const std::string again = own_dir_.file("resaved");
        std::remove(again.c_str());
        ASSERT_GT(kova_save_source(ctx_, id, again.c_str()), 0);
        EXPECT_TRUE(read_file(again) == expected_file(KOVA_ORIGIN_SAVEFILE));
    }
}

// A fixed stroke played from the file gives the same samples on every machine.
TEST_F(CrossArch, SameStrokeSameSamples) {
    int32_t err = 0;
    ASSERT_EQ(kova_reg_src_bysavefile(ctx_, own_file().c_str(), &err), 1) << err;
    ASSERT_EQ(kova_set_active_src(ctx_, 1), KOVA_OK);
    std::vector<int16_t> all;
    std::vector<int16_t> buf(96000);
    KOVA_PCMBUF out{buf.data(), static_cast<int32_t>(buf.size() * 2)};
    KOVA_PARAM ev{100.0f, 300.0f, 1000, 0.0f, KOVA_ACTION_START};
    for (int i = 0; i < 40; ++i) {
        const int32_t bytes = kova_gen_sounds(ctx_, &ev, &out);
        ASSERT_GE(bytes, 0);
        all.insert(all.end(), buf.begin(), buf.begin() + bytes / 2);
        ev.action = i == 38 ? KOVA_ACTION_END : KOVA_ACTION_MOVE;
        ev.x += 9.0f + static_cast<float>(i % 7) * 4.0f;
        ev.y += 15.0f;
        ev.time += 16;
    }
    ASSERT_GT(all.size(), 20000u);
    // Stored as 16-bit little-endian, as the device plays it.
    Bytes le;
    for (int16_t s : all) put(le, static_cast<uint16_t>(s), 2);
    std::ofstream(dir_ + "/gen-" + kArch + ".pcm", std::ios::binary)
        .write(reinterpret_cast<const char*>(le.data()), static_cast<std::streamsize>(le.size()));
    for (const std::string& other : files("gen-", ".pcm"))
        EXPECT_TRUE(read_file(other) == le) << other;
}

}  // namespace
