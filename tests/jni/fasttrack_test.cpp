#include "kova/android/kova_fasttrack.h"

#include <android/log.h>
#include <gtest/gtest.h>
#include <media/AudioTrack.h>

#include <numeric>
#include <vector>

#include "kova/kova_output.h"
#include "kova_host/audio_sink.h"
#include "support/log_capture.h"
#include "util/kova_mem.h"

namespace {

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

}  // namespace
