// The stream against the stand-in device: a writer thread feeds blocks at playback pace while the
// device's thread pulls bursts; what the device received must be exactly the written blocks.
#include <gtest/gtest.h>
#include <sndfile.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <cstdint>
#include <string>
#include <thread>
#include <vector>

#include "kova/android/kova_fasttrack.h"
#include "kova_host/audio_sink.h"

namespace {

using namespace std::chrono_literals;

constexpr int kRate = 48000;
constexpr int kChannels = 2;
constexpr size_t kBurstBytes = 192 * kChannels * sizeof(int16_t);  // 4 ms

/* Waits (bounded, so a broken stream fails instead of hanging) until `done` holds. */
template <typename Pred>
bool wait_for(Pred done) {
    const auto give_up = std::chrono::steady_clock::now() + 30s;
    while (!done()) {
        if (std::chrono::steady_clock::now() > give_up) return false;
        std::this_thread::sleep_for(2ms);
    }
    return true;
}

std::vector<uint8_t> captured() {
    std::vector<uint8_t> bytes(kova_host_capture_size());
    bytes.resize(kova_host_capture_copy(bytes.data(), bytes.size()));
    return bytes;
}

TEST(FastTrackDevice, DeviceReceivesExactlyTheWrittenBlocksAcrossUnderruns) {
    kova_host_use_capture_sink();
    kova_host_capture_clear();
    kova_host_reset_counters();
    KOVA_FASTTRACK* ft = kova_open_fasttrack(kRate, kChannels);
    kova_host_use_null_sink();
    ASSERT_NE(ft, nullptr);
    kova_start_fasttrack(ft);

    // Blocks of uneven length whose samples count up, so loss, reordering or invented data
    // shows; a pause in the middle starves the device for several bursts.
    std::vector<int16_t> written;
    int refused = 0;
    std::thread writer([&] {
        int16_t next = 1;
        for (int i = 0; i < 150; ++i) {
            const size_t frames = 120 + static_cast<size_t>(i * 37 % 200);
            std::vector<int16_t> block(frames * kChannels);
            for (int16_t& s : block) {
                s = next++;
                if (next == 0) next = 1;  // zero is reserved for the device's silence
            }
            const uint32_t bytes = static_cast<uint32_t>(block.size() * sizeof(int16_t));
            if (kova_write_fasttrack(ft, block.data(), bytes, bytes) == bytes) {
                written.insert(written.end(), block.begin(), block.end());
            } else {
                ++refused;
            }
            std::this_thread::sleep_for(
                i == 60 ? 40ms : std::chrono::microseconds(frames * 1000000 / kRate));
        }
    });
    writer.join();
    EXPECT_EQ(refused, 0);
    const size_t total = written.size() * sizeof(int16_t);

    ASSERT_TRUE(wait_for([&] { return kova_host_capture_size() >= total; }));
    // A few more bursts with nothing queued must add nothing.
    const unsigned long after_drain = kova_host_callbacks();
    ASSERT_TRUE(wait_for([&] { return kova_host_callbacks() >= after_drain + 3; }));
    EXPECT_GE(kova_host_underruns(), 3u);

    // The stream marks itself playing only after the device has been started, so a burst pulled
    // in between is answered untouched and plays as silence; beyond such leading silent bursts
    // the device must have received the blocks and nothing else.
    const std::vector<uint8_t> bytes = captured();
    ASSERT_GE(bytes.size(), total);
    const size_t lead = bytes.size() - total;
    EXPECT_EQ(lead % kBurstBytes, 0u);
    EXPECT_LE(lead, 2 * kBurstBytes);
    EXPECT_TRUE(std::all_of(bytes.begin(), bytes.begin() + lead, [](uint8_t b) { return b == 0; }));
    EXPECT_EQ(0, memcmp(bytes.data() + lead, written.data(), total));

    // The capture as a WAV file, read back by libsndfile. Written while still playing: with
    // nothing queued the device adds nothing.
    const std::string path = ::testing::TempDir() + "fasttrack_device_capture.wav";
    ASSERT_EQ(kova_host_capture_write_wav(path.c_str(), kRate, kChannels), 0);
    kova_stop_fasttrack(ft);
    kova_close_fasttrack(ft, 1);

    SF_INFO info{};
    SNDFILE* file = sf_open(path.c_str(), SFM_READ, &info);
    ASSERT_NE(file, nullptr);
    EXPECT_EQ(info.samplerate, kRate);
    EXPECT_EQ(info.channels, kChannels);
    EXPECT_EQ(info.format, SF_FORMAT_WAV | SF_FORMAT_PCM_16);
    ASSERT_EQ(static_cast<size_t>(info.frames), bytes.size() / (kChannels * sizeof(int16_t)));
    std::vector<int16_t> samples(bytes.size() / sizeof(int16_t));
    EXPECT_EQ(sf_readf_short(file, samples.data(), info.frames), info.frames);
    sf_close(file);
    EXPECT_EQ(0, memcmp(samples.data(), bytes.data(), bytes.size()));
    std::remove(path.c_str());

    EXPECT_EQ(kova_host_capture_write_wav(nullptr, kRate, kChannels), -1);
    EXPECT_EQ(kova_host_capture_write_wav(path.c_str(), kRate, 0), -1);
    EXPECT_EQ(kova_host_capture_write_wav("/nonexistent-dir/x.wav", kRate, kChannels), -1);
    kova_host_capture_clear();
    EXPECT_EQ(kova_host_capture_size(), 0u);
}

/* A device that stopped draining: closing the stream returns after a short, bounded wait, the
 * callback is never called again (the handle is freed by then; AddressSanitizer would see it),
 * and the held-up thread ends on its own once its write returns. */
TEST(FastTrackDevice, CloseDuringAStalledWriteIsBounded) {
    kova_host_use_stall_sink(1500);
    kova_host_reset_counters();
    KOVA_FASTTRACK* ft = kova_open_fasttrack(kRate, kChannels);
    kova_host_use_null_sink();
    ASSERT_NE(ft, nullptr);
    kova_start_fasttrack(ft);
    ASSERT_TRUE(wait_for([] { return kova_host_callbacks() >= 1; }));  // now in its 1.5 s write
    const unsigned long callbacks = kova_host_callbacks();

    const auto t0 = std::chrono::steady_clock::now();
    kova_stop_fasttrack(ft);
    kova_close_fasttrack(ft, 1);
    EXPECT_LT(std::chrono::steady_clock::now() - t0, 600ms);
    EXPECT_EQ(kova_host_lingering_tracks(), 1u);

    ASSERT_TRUE(wait_for([] { return kova_host_lingering_tracks() == 0; }));
    EXPECT_EQ(kova_host_callbacks(), callbacks);
}

}  // namespace
