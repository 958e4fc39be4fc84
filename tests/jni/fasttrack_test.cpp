// SPDX-License-Identifier: Apache-2.0
// The fast-track stream from both sides: its calls with the device held (log lines, all-or-nothing
// writes, the callback), and against the stand-in device, where a writer thread feeds blocks at
// playback pace while the device's thread pulls bursts and must receive exactly the written blocks.
#include "kova/android/kova_fasttrack.h"

#include <android/log.h>
#include <gtest/gtest.h>
#include <sndfile.h>
#include <media/AudioTrack.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <numeric>
#include <string>
#include <thread>
#include <vector>

#include "kova/kova_output.h"
#include "kova_host/audio_sink.h"
#include "support/log_capture.h"
#include "support/temp_dir.h"
#include "util/kova_mem.h"

namespace {

using namespace std::chrono_literals;

using kova_test::LogCapture;
using kova_test::LogLine;

constexpr const char* kTag = "kova_fasttrack";
const std::string kOpened = "kova_init::openFastTrack(48000Hz,2Ch, FC:0) is finished successfully";
const std::string kClosed = "kova_close_fasttrack() is finished successfully";

std::vector<uint8_t> pattern(size_t n, uint8_t first = 1) {
    std::vector<uint8_t> v(n);
    std::iota(v.begin(), v.end(), first);
    return v;
}

/* The device is held so that nothing but the test drains the ring. */
class FastTrack : public ::testing::Test {
   protected:
    void SetUp() override {
        kova_host_use_null_sink();
        kova_host_hold_device(1);
    }
    void TearDown() override {
        kova_host_hold_device(0);
        kova_mem_fail_after(-1);
    }

    LogLine line(const std::string& message) { return {ANDROID_LOG_DEBUG, kTag, message}; }

    LogCapture log;
};

TEST_F(FastTrack, OpenStopStartCloseLogTheirLines) {
    KOVA_FASTTRACK* ft = kova_open_fasttrack(48000, 2);
    ASSERT_NE(ft, nullptr);
    EXPECT_EQ(ft->state, 0);
    EXPECT_EQ(ft->pRing->size, 524288u);
    kova_start_fasttrack(ft);
    EXPECT_EQ(ft->state, 1);
    kova_start_fasttrack(ft);  // already playing: nothing
    kova_stop_fasttrack(ft);
    EXPECT_EQ(ft->state, 0);
    kova_stop_fasttrack(ft);  // already stopped: nothing
    kova_close_fasttrack(ft, 1);
    EXPECT_EQ(log.lines(), (std::vector<LogLine>{line(kOpened), line("kova_start_fasttrack()"),
                                                 line("kova_stop_fasttrack()"), line(kClosed)}));
}

TEST_F(FastTrack, FailedOpensCloseWhatTheyAllocatedAndLogWhy) {
    EXPECT_EQ(kova_open_fasttrack(48001, 2), nullptr);
    EXPECT_EQ(kova_open_fasttrack(48000, 0), nullptr);
    EXPECT_EQ(log.messages(kTag), (std::vector<std::string>{kClosed, kClosed}));

    log.clear();
    kova_host_fail_next_open(-19);
    EXPECT_EQ(kova_open_fasttrack(48000, 2), nullptr);
    EXPECT_EQ(
        log.lines(),
        (std::vector<LogLine>{
            line("kova_init::openFastTrack(48000Hz,2Ch,FC:0) is failed (initCheck(ffffffed))"),
            line("kova_close_fasttrack() is finished (initCheck() is failed)")}));

    // The forced failure was one-shot; mono opens too.
    log.clear();
    KOVA_FASTTRACK* mono = kova_open_fasttrack(8000, 1);
    ASSERT_NE(mono, nullptr);
    kova_close_fasttrack(mono, 1);
    EXPECT_EQ(log.messages(kTag),
              (std::vector<std::string>{
                  "kova_init::openFastTrack(8000Hz,1Ch, FC:0) is finished successfully", kClosed}));
}

TEST_F(FastTrack, WritesAreAllOrNothingAndOnlyWhilePlaying) {
    const std::vector<uint8_t> block = pattern(3840);
    KOVA_FASTTRACK* ft = kova_open_fasttrack(48000, 2);
    ASSERT_NE(ft, nullptr);
    EXPECT_EQ(kova_write_fasttrack(ft, block.data(), 3840, 3840), 0u);
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 0u);

    kova_start_fasttrack(ft);
    EXPECT_EQ(kova_write_fasttrack(ft, block.data(), 3840, 3840), 3840u);
    EXPECT_EQ(kova_write_fasttrack(ft, block.data(), 3840, 0), 0u);
    EXPECT_EQ(kova_write_fasttrack(ft, block.data(), 100, 3840), 100u);  // capacity too small
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 3840u);

    const std::vector<uint8_t> big = pattern(524000 - 3840, 9);
    EXPECT_EQ(kova_write_fasttrack(ft, big.data(), 960000, 524000 - 3840), 524000u - 3840u);
    EXPECT_EQ(kova_write_fasttrack(ft, block.data(), 3840, 3840), 287u);
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 524000u);

    // A stop discards what is queued; after a new start the ring is empty again.
    kova_stop_fasttrack(ft);
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 0u);
    EXPECT_EQ(kova_write_fasttrack(ft, block.data(), 3840, 3840), 0u);
    kova_start_fasttrack(ft);
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 0u);
    kova_close_fasttrack(ft, 1);
}

TEST_F(FastTrack, CallbackHandsOverWhatIsStoredAndNeverPadsOrInvents) {
    KOVA_FASTTRACK* ft = kova_open_fasttrack(48000, 2);
    ASSERT_NE(ft, nullptr);
    kova_start_fasttrack(ft);
    const std::vector<uint8_t> block = pattern(600, 40);
    ASSERT_EQ(kova_write_fasttrack(ft, block.data(), 600, 600), 600u);

    std::vector<uint8_t> room(1024, 0xEE);
    android::AudioTrack::Buffer buffer{};
    buffer.frameCount = 256;
    buffer.size = 1024;
    buffer.raw = room.data();
    FastTrackCallback(android::AudioTrack::EVENT_MORE_DATA, ft, &buffer);
    EXPECT_EQ(buffer.size, 600u);
    EXPECT_EQ(buffer.frameCount, 256u);
    EXPECT_TRUE(std::equal(block.begin(), block.end(), room.begin()));
    EXPECT_EQ(room[600], 0xEE);
    EXPECT_EQ(ft->lastAvail, 600u);
    EXPECT_EQ(ft->lastCopied, 600u);
    EXPECT_EQ(ft->pBuffer, &buffer);

    buffer.size = 1024;
    FastTrackCallback(android::AudioTrack::EVENT_MORE_DATA, ft, &buffer);
    EXPECT_EQ(buffer.size, 0u);

    // Other events, a missing user pointer and a stopped stream leave the buffer alone.
    kova_write_fasttrack(ft, block.data(), 600, 600);
    buffer.size = 1024;
    FastTrackCallback(android::AudioTrack::EVENT_UNDERRUN, ft, &buffer);
    FastTrackCallback(android::AudioTrack::EVENT_MORE_DATA, nullptr, &buffer);
    EXPECT_EQ(buffer.size, 1024u);
    // A missing buffer is logged; a buffer without data pointer is skipped without a word.
    log.clear();
    FastTrackCallback(android::AudioTrack::EVENT_MORE_DATA, ft, nullptr);
    EXPECT_EQ(log.lines(),
              std::vector<LogLine>{line("FastTrackCallback(event:0, parameter error)")});
    android::AudioTrack::Buffer no_data{};
    no_data.size = 32;
    FastTrackCallback(android::AudioTrack::EVENT_MORE_DATA, ft, &no_data);
    EXPECT_EQ(no_data.size, 32u);
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 600u);
    kova_stop_fasttrack(ft);
    FastTrackCallback(android::AudioTrack::EVENT_MORE_DATA, ft, &buffer);
    EXPECT_EQ(buffer.size, 1024u);
    kova_close_fasttrack(ft, 1);
}

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
    kova_test::TempDir dir;
    const std::string path = dir.file("capture.wav");
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
