// SPDX-License-Identifier: Apache-2.0
// Source-set files are portable between the machines the library runs on: a file written on
// x86-64 reads back on AArch64 exactly as on the machine that wrote it, and the other way round.
//
// Each run builds the same set through the engine, saves it as srcset-ARCH.kss in the exchange
// directory (KOVA_XARCH_DIR; a fresh temporary directory when unset) and checks the bytes against
// an image encoded here field by field in little-endian order. It then reads every srcset-*.kss
// found there, whichever machine wrote it, and checks what the engine and the file queries make
// of it, and compares the sound a fixed stroke produces from it with gen-*.pcm of other machines.
// scripts/aarch64.sh runs this test natively, then under qemu-aarch64, then natively again, so
// each machine reads the other's file.
#include <dirent.h>
#include <gtest/gtest.h>
#include <stdlib.h>

#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

#include "kova/kova.h"

namespace {

#if defined(__x86_64__)
constexpr const char* kArch = "x86_64";
#elif defined(__aarch64__)
constexpr const char* kArch = "aarch64";
#else
constexpr const char* kArch = "other";
#endif

using Bytes = std::vector<uint8_t>;

// Little-endian encoder, independent of the host's byte order and struct layout.
struct Image {
    Bytes b;
    void u32(uint32_t v) {
        for (int i = 0; i < 4; ++i) b.push_back(static_cast<uint8_t>(v >> (8 * i)));
    }
    void i32(int32_t v) { u32(static_cast<uint32_t>(v)); }
    void f64(double d) {
        uint64_t v;
        std::memcpy(&v, &d, 8);
        for (int i = 0; i < 8; ++i) b.push_back(static_cast<uint8_t>(v >> (8 * i)));
    }
    void zeros(size_t n) { b.insert(b.end(), n, 0); }
    void raw(const Bytes& data) { b.insert(b.end(), data.begin(), data.end()); }
};

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

// The file a set saved on any machine must be, byte for byte. Reference words and padding are
// written as zeros; `origin` is 1 for sources loaded from PCM files, 2 once read from a file.
Bytes expected_file(int32_t origin) {
    Image im;
    im.i32(2);
    for (const KOVA_FLT_DSC& d : kFilters) {
        im.u32(d.type);
        im.zeros(4);
        im.f64(d.freq);
        im.f64(d.bandwidth);
        im.u32(d.enable);
        im.i32(d.samplerate);
        im.i32(d.channels);
        im.zeros(4);
    }
    const KOVA_TUNE_SET& t = kTune;
    im.f64(t.gain);
    im.f64(t.pan);
    im.i32(t.osc_enable);
    im.zeros(4);
    im.f64(t.osc_depth);
    im.i32(t.sharp_enable);
    im.zeros(4);
    for (double v : {t.sharpness, t.wn_gain, t.file_gain, t.start_gain, t.loop_gain, t.end_gain}) {
        im.f64(v);
    }
    for (int32_t v : {1, 1, 1, 48000, 2}) im.i32(v);
    for (int slot = 0; slot < 3; ++slot) {
        im.zeros(24);
        im.i32(kSizes[slot]);
        im.i32(0);  // play position
        im.i32(slot);
        im.i32(origin);
        im.i32(slot == KOVA_SLOT_LOOP ? kLoopRepeatMs[0] * 192 : 0);
        im.i32(slot == KOVA_SLOT_LOOP ? kLoopRepeatMs[1] * 192 : kSizes[slot]);
        im.raw(pcm(slot));
    }
    return im.b;
}

Bytes read_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

void write_file(const std::string& path, const void* data, size_t n) {
    std::ofstream(path, std::ios::binary | std::ios::trunc)
        .write(static_cast<const char*>(data), static_cast<std::streamsize>(n));
}

// First differing offset, or -1.
long first_difference(const Bytes& a, const Bytes& b) {
    const size_t n = std::min(a.size(), b.size());
    for (size_t i = 0; i < n; ++i) {
        if (a[i] != b[i]) return static_cast<long>(i);
    }
    return a.size() == b.size() ? -1 : static_cast<long>(n);
}

class CrossArch : public testing::Test {
   protected:
    void SetUp() override {
        const char* env = std::getenv("KOVA_XARCH_DIR");
        if (env != nullptr && *env != '\0') {
            dir_ = env;
            std::filesystem::create_directories(dir_);
        } else {
            char templ[] = "/tmp/kova_xarch_XXXXXX";
            dir_ = mkdtemp(templ);
            own_dir_ = true;
        }
        int32_t err = 0;
        ctx_ = kova_init(&kFormat, &err);
        ASSERT_NE(ctx_, nullptr);
        save_own_file();
    }

    std::string own_file() const { return dir_ + "/srcset-" + kArch + ".kss"; }

    // Builds the set through the engine in a context of its own and saves it as this machine's
    // file: PCM files, two filters, a tune set and loop repeat points.
    void save_own_file() {
        int32_t err = 0;
        KOVA_CTX* ctx = kova_init(&kFormat, &err);
        ASSERT_NE(ctx, nullptr);
        std::string paths[3];
        const char* cpaths[3];
        for (int slot = 0; slot < 3; ++slot) {
            paths[slot] = dir_ + "/.pcm-" + kArch + "-" + std::to_string(slot);
            const Bytes data = pcm(slot);
            write_file(paths[slot], data.data(), data.size());
            cpaths[slot] = paths[slot].c_str();
        }
        EXPECT_EQ(kova_reg_src_byfiles(ctx, cpaths, &err), 1);
        for (const KOVA_FLT_DSC& d : kFilters) EXPECT_EQ(kova_attach_filter(ctx, 1, &d, &err), 1);
        EXPECT_EQ(kova_set_tuneset(ctx, 1, &kTune), KOVA_OK);
        KOVA_RPT_INFO rpt{{0, 0, 0}, {-1, kLoopRepeatMs[0], -1}, {-1, kLoopRepeatMs[1], -1}};
        EXPECT_EQ(kova_set_rptinfo(ctx, 1, &rpt), KOVA_OK);
        for (const std::string& p : paths) std::remove(p.c_str());
        std::remove(own_file().c_str());  // saving does not truncate
        saved_bytes_ = kova_save_source(ctx, 1, own_file().c_str());
        kova_deinit(ctx);
    }
    void TearDown() override {
        if (ctx_ != nullptr) kova_deinit(ctx_);
        if (own_dir_) std::filesystem::remove_all(dir_);
    }

    std::vector<std::string> files(const char* prefix, const char* suffix) const {
        std::vector<std::string> out;
        for (const auto& e : std::filesystem::directory_iterator(dir_)) {
            const std::string name = e.path().filename().string();
            if (name.rfind(prefix, 0) == 0 && name.size() > std::strlen(suffix) &&
                name.compare(name.size() - std::strlen(suffix), std::string::npos, suffix) == 0) {
                out.push_back(e.path().string());
            }
        }
        return out;
    }

    std::string dir_;
    bool own_dir_ = false;
    KOVA_CTX* ctx_ = nullptr;
    int32_t saved_bytes_ = 0;
};

// Saving on this machine writes exactly the little-endian image.
TEST_F(CrossArch, SavedFileIsTheLittleEndianImage) {
    const Bytes expected = expected_file(KOVA_ORIGIN_FILE);
    EXPECT_EQ(saved_bytes_, static_cast<int32_t>(expected.size()));
    const Bytes written = read_file(own_file());
    EXPECT_EQ(written.size(), expected.size());
    EXPECT_EQ(first_difference(written, expected), -1);
}

// Every machine's file reads back the same: engine view, queries, a re-save, and the sound.
TEST_F(CrossArch, FilesFromEveryMachineReadTheSame) {
    const std::vector<std::string> sets = files("srcset-", ".kss");
    ASSERT_FALSE(sets.empty());
    const Bytes expected = expected_file(KOVA_ORIGIN_FILE);
    for (const std::string& path : sets) {
        SCOPED_TRACE(path);
        EXPECT_EQ(first_difference(read_file(path), expected), -1);

        int off[3] = {-7, -7, -7}, size[3] = {-7, -7, -7};
        ASSERT_EQ(kova_get_pcminfo_fromfile(path.c_str(), &off[0], &size[0], &off[1], &size[1],
                                            &off[2], &size[2]),
                  KOVA_OK);
        const int first = 4 + 40 * 2 + 88 + 20 + 48;
        EXPECT_EQ(off[0], first);
        EXPECT_EQ(off[1], first + kSizes[0] + 48);
        EXPECT_EQ(off[2], first + kSizes[0] + 48 + kSizes[1] + 48);
        for (int slot = 0; slot < 3; ++slot) EXPECT_EQ(size[slot], kSizes[slot]);

        int32_t err = 0;
        const int32_t id = kova_reg_src_bysavefile(ctx_, path.c_str(), &err);
        ASSERT_GE(id, 1) << err;
        KOVA_TUNE_SET tune{};
        ASSERT_EQ(kova_get_tuneset(ctx_, id, &tune), KOVA_OK);
        EXPECT_EQ(std::memcmp(&tune.gain, &kTune.gain, 16), 0);
        EXPECT_EQ(tune.osc_enable, 1);
        EXPECT_EQ(tune.sharp_enable, 1);
        EXPECT_EQ(tune.sharpness, kTune.sharpness);
        EXPECT_EQ(tune.file_gain, kTune.file_gain);
        EXPECT_EQ(tune.end_gain, kTune.end_gain);
        KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT] = {};
        kova_get_filters(ctx_, id, flt);
        EXPECT_EQ(flt[KOVA_FLT_LOWPASS].freq, kFilters[0].freq);
        EXPECT_EQ(flt[KOVA_FLT_BANDPASS].bandwidth, kFilters[1].bandwidth);
        KOVA_RPT_INFO rpt{};
        ASSERT_EQ(kova_get_rptinfo(ctx_, id, &rpt), KOVA_OK);
        EXPECT_EQ(rpt.len_ms[0], 20);
        EXPECT_EQ(rpt.len_ms[1], 100);
        EXPECT_EQ(rpt.len_ms[2], 10);
        EXPECT_EQ(rpt.rpt_start_ms[1], kLoopRepeatMs[0]);
        EXPECT_EQ(rpt.rpt_end_ms[1], kLoopRepeatMs[1]);

        // Saved again here, it is the same file with every source now marked as read back.
        const std::string again = dir_ + "/.resaved-" + kArch;
        std::remove(again.c_str());
        ASSERT_GT(kova_save_source(ctx_, id, again.c_str()), 0);
        EXPECT_EQ(first_difference(read_file(again), expected_file(KOVA_ORIGIN_SAVEFILE)), -1);
        std::remove(again.c_str());
    }
}

// A fixed stroke played from the file gives the same samples on every machine.
TEST_F(CrossArch, SameStrokeSameSamples) {
    int32_t err = 0;
    const int32_t id = kova_reg_src_bysavefile(ctx_, own_file().c_str(), &err);
    ASSERT_EQ(id, 1) << err;
    ASSERT_EQ(kova_set_active_src(ctx_, id), KOVA_OK);
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
    for (int16_t s : all) {
        le.push_back(static_cast<uint8_t>(static_cast<uint16_t>(s) & 0xFF));
        le.push_back(static_cast<uint8_t>(static_cast<uint16_t>(s) >> 8));
    }
    write_file(dir_ + "/gen-" + kArch + ".pcm", le.data(), le.size());
    for (const std::string& other : files("gen-", ".pcm")) {
        SCOPED_TRACE(other);
        const long at = first_difference(read_file(other), le);
        EXPECT_EQ(at, -1) << "first different sample " << at / 2;
    }
}

}  // namespace
