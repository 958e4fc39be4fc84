// SPDX-License-Identifier: Apache-2.0
// The output stream from its ring buffer up: the ring against a plain queue, the fast-track calls
// with the device held (log lines, all-or-nothing writes, the callback). That the device receives
// exactly the written blocks across underruns, the soak suite and the Java suite check on the
// stand-in device's own thread; a close while the device stalls, the registry suite.
#include "kova/android/kova_fasttrack.h"

#include <android/log.h>
#include <gtest/gtest.h>
#include <media/AudioTrack.h>

#include <deque>
#include <memory>
#include <numeric>
#include <random>
#include <string>
#include <vector>

#include "kova/kova_output.h"
#include "kova_host/audio_sink.h"
#include "support/log_capture.h"

namespace {

using kova_test::LogLine;

std::vector<uint8_t> pattern(size_t n, uint8_t first) {
    std::vector<uint8_t> v(n);
    std::iota(v.begin(), v.end(), first);
    return v;
}

using Ring = std::unique_ptr<KOVA_RINGBUFFER, decltype(&kova_ringbuffer_free)>;

// Random writes and reads against a plain queue: contents, order and both spaces agree at every
// step, across many wraps (a ring holds one byte less than its size); a reset empties the queue
// and zeroes the storage.
TEST(RingBuffer, AgreesWithAQueueUnderRandomTraffic) {
    Ring rb(kova_ringbuffer_create(256), kova_ringbuffer_free);
    std::deque<uint8_t> model;
    std::mt19937 rng(12345);
    uint8_t next = 0;
    std::vector<uint8_t> buf(300);
    for (int step = 0; step < 5000; ++step) {
        const uint32_t len = rng() % 300;
        if (rng() % 2) {
            for (uint32_t i = 0; i < len; ++i) buf[i] = static_cast<uint8_t>(next + i);
            const uint32_t stored = kova_ringbuffer_write(rb.get(), buf.data(), len);
            ASSERT_EQ(stored, std::min<uint32_t>(len, 255 - model.size()));
            model.insert(model.end(), buf.begin(), buf.begin() + stored);
            next = static_cast<uint8_t>(next + stored);
        } else {
            const uint32_t got = kova_ringbuffer_read(rb.get(), buf.data(), len);
            ASSERT_EQ(got, std::min<uint32_t>(len, model.size()));
            ASSERT_TRUE(std::equal(buf.begin(), buf.begin() + got, model.begin()));
            model.erase(model.begin(), model.begin() + got);
        }
        ASSERT_EQ(kova_ringbuffer_read_space(rb.get()), model.size());
        ASSERT_EQ(kova_ringbuffer_write_space(rb.get()), 255u - model.size());
    }
    kova_ringbuffer_write(rb.get(), buf.data(), 200);
    kova_ringbuffer_reset(rb.get());
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 0u);
    EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), 255u);
    EXPECT_TRUE(std::all_of(rb->buf, rb->buf + 256, [](uint8_t b) { return b == 0; }));

    // The smallest ring holds one byte (the stream's ring, rounded up to a power of two, is
    // measured by FastTrack.WritesAreAllOrNothingAndOnlyWhilePlaying; a size no 32-bit power of
    // two covers is a row of the contract table).
    Ring tiny(kova_ringbuffer_create(0), kova_ringbuffer_free);
    EXPECT_EQ(kova_ringbuffer_write(tiny.get(), buf.data(), 2), 1u);
}

// The device is held so that nothing but the test drains the ring.
class FastTrack : public ::testing::Test {
   protected:
    void SetUp() override {
        kova_host_use_null_sink();
        kova_host_hold_device(1);
        ft = kova_open_fasttrack(48000, 2);
        ASSERT_NE(ft, nullptr);
        log.clear();
    }
    void TearDown() override {
        kova_close_fasttrack(ft, 1);
        kova_host_hold_device(0);
    }
    static LogLine line(const std::string& message) {
        return {ANDROID_LOG_DEBUG, "kova_fasttrack", message};
    }
    uint32_t write(const std::vector<uint8_t>& b, uint32_t capacity) {
        return kova_write_fasttrack(ft, b.data(), capacity, static_cast<uint32_t>(b.size()));
    }

    KOVA_FASTTRACK* ft = nullptr;
    kova_test::LogCapture log;
};

TEST_F(FastTrack, OpenStartStopAndCloseLogTheirLinesOnce) {
    KOVA_FASTTRACK* other = kova_open_fasttrack(48000, 2);
    ASSERT_NE(other, nullptr);
    kova_start_fasttrack(other);
    kova_start_fasttrack(other);  // already playing: nothing
    kova_stop_fasttrack(other);
    kova_stop_fasttrack(other);  // already stopped: nothing
    kova_close_fasttrack(other, 1);
    const LogLine closed = line("kova_close_fasttrack() is finished successfully");
    EXPECT_EQ(log.lines(),
              (std::vector<LogLine>{
                  line("kova_init::openFastTrack(48000Hz,2Ch, FC:0) is finished successfully"),
                  line("kova_start_fasttrack()"), line("kova_stop_fasttrack()"), closed}));

    // Failed opens close what they allocated and say why.
    log.clear();
    EXPECT_EQ(kova_open_fasttrack(48001, 2), nullptr);
    kova_host_fail_next_open(-19);
    EXPECT_EQ(kova_open_fasttrack(48000, 2), nullptr);
    EXPECT_EQ(
        log.lines(),
        (std::vector<LogLine>{
            closed,
            line("kova_init::openFastTrack(48000Hz,2Ch,FC:0) is failed (initCheck(ffffffed))"),
            line("kova_close_fasttrack() is finished (initCheck() is failed)")}));
}

TEST_F(FastTrack, WritesAreAllOrNothingAndOnlyWhilePlaying) {
    const std::vector<uint8_t> block = pattern(3840, 1);
    EXPECT_EQ(write(block, 3840), 0u);  // stopped
    kova_start_fasttrack(ft);
    EXPECT_EQ(write(block, 3840), 3840u);
    EXPECT_EQ(kova_write_fasttrack(ft, block.data(), 3840, 0), 0u);
    EXPECT_EQ(write(block, 100), 100u);  // capacity too small: refused, the room is reported
    EXPECT_EQ(write(pattern(524000 - 3840, 9), 960000), 524000u - 3840u);
    EXPECT_EQ(write(block, 3840), 287u);  // does not fit whole
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 524000u);

    // A stop discards what is queued and refuses writes.
    kova_stop_fasttrack(ft);
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 0u);
    EXPECT_EQ(write(block, 3840), 0u);
}

// What the callback hands over and how it shortens an underrun, the soak suite checks at the
// device; here the requests it must leave alone.
TEST_F(FastTrack, CallbackLeavesOtherRequestsAlone) {
    kova_start_fasttrack(ft);
    ASSERT_EQ(write(pattern(600, 40), 600), 600u);
    std::vector<uint8_t> room(1024, 0xEE);
    android::AudioTrack::Buffer buffer{};
    auto pull = [&](int event, void* user, size_t size) {
        buffer.size = size;
        FastTrackCallback(event, user, &buffer);
        return buffer.size;
    };
    constexpr int kMore = android::AudioTrack::EVENT_MORE_DATA;
    // A buffer without data pointer is skipped without a word; a missing buffer is logged.
    EXPECT_EQ(pull(kMore, ft, 32), 32u);
    FastTrackCallback(kMore, ft, nullptr);
    EXPECT_EQ(log.lines(),
              (std::vector<LogLine>{line("kova_start_fasttrack()"),
                                    line("FastTrackCallback(event:0, parameter error)")}));
    // Other events, a missing user pointer and a stopped stream leave the buffer alone.
    buffer.raw = room.data();
    EXPECT_EQ(pull(android::AudioTrack::EVENT_UNDERRUN, ft, 1024), 1024u);
    EXPECT_EQ(pull(kMore, nullptr, 1024), 1024u);
    EXPECT_EQ(kova_ringbuffer_read_space(ft->pRing), 600u);
    kova_stop_fasttrack(ft);
    EXPECT_EQ(pull(kMore, ft, 1024), 1024u);
    EXPECT_EQ(room, std::vector<uint8_t>(1024, 0xEE));
}

}  // namespace
