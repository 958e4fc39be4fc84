#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <deque>
#include <numeric>
#include <vector>

#include "kova/kova_output.h"
#include "util/kova_mem.h"

namespace {

struct RingDeleter {
    void operator()(KOVA_RINGBUFFER* rb) const { kova_ringbuffer_free(rb); }
};
using Ring = std::unique_ptr<KOVA_RINGBUFFER, RingDeleter>;

std::vector<uint8_t> pattern(size_t n, uint8_t first) {
    std::vector<uint8_t> v(n);
    std::iota(v.begin(), v.end(), first);
    return v;
}

TEST(RingBuffer, CreateRoundsUpToPowerOfTwoOfAtLeastTwo) {
    const std::pair<uint32_t, uint32_t> cases[] = {
        {0, 2}, {1, 2}, {2, 2}, {3, 4}, {4096, 4096}, {4097, 8192}, {384000, 524288}};
    for (auto [requested, size] : cases) {
        Ring rb(kova_ringbuffer_create(requested));
        ASSERT_NE(rb, nullptr) << requested;
        EXPECT_EQ(rb->size, size) << requested;
        EXPECT_EQ(rb->mask, size - 1) << requested;
        EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 0u);
        EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), size - 1);
    }
}

TEST(RingBuffer, RequestsWithoutA32BitPowerOfTwoAreRefusedWithoutAllocating) {
    const unsigned long before = kova_mem_alloc_count();
    EXPECT_EQ(kova_ringbuffer_create(0x80000001u), nullptr);
    EXPECT_EQ(kova_ringbuffer_create(0xFFFFFFFFu), nullptr);
    EXPECT_EQ(kova_mem_alloc_count(), before);
}

TEST(RingBuffer, AllocationFailuresGiveNullAndLeakNothing) {
    for (long n : {0L, 1L}) {
        kova_mem_fail_after(n);
        EXPECT_EQ(kova_ringbuffer_create(64), nullptr) << n;
        kova_mem_fail_after(-1);
    }
}

TEST(RingBuffer, HoldsSizeMinusOneBytes) {
    Ring tiny(kova_ringbuffer_create(1));
    const uint8_t two[2] = {7, 8};
    EXPECT_EQ(kova_ringbuffer_write(tiny.get(), two, 2), 1u);
    EXPECT_EQ(kova_ringbuffer_write(tiny.get(), two, 1), 0u);
    uint8_t out[2] = {};
    EXPECT_EQ(kova_ringbuffer_read(tiny.get(), out, 2), 1u);
    EXPECT_EQ(out[0], 7);

    Ring rb(kova_ringbuffer_create(384000));
    const std::vector<uint8_t> block = pattern(524288, 3);
    EXPECT_EQ(kova_ringbuffer_write(rb.get(), block.data(), 524288), 524287u);
    EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), 0u);
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 524287u);
    EXPECT_EQ(kova_ringbuffer_write(rb.get(), block.data(), 1), 0u);
    std::vector<uint8_t> back(524288);
    EXPECT_EQ(kova_ringbuffer_read(rb.get(), back.data(), 524288), 524287u);
    back.pop_back();
    EXPECT_TRUE(std::equal(back.begin(), back.end(), block.begin()));
}

TEST(RingBuffer, WriteAcrossTheEndLandsInTwoPiecesAndReadsBackInOrder) {
    Ring rb(kova_ringbuffer_create(16));
    const std::vector<uint8_t> head = pattern(10, 100);
    uint8_t sink[16];
    ASSERT_EQ(kova_ringbuffer_write(rb.get(), head.data(), 10), 10u);
    ASSERT_EQ(kova_ringbuffer_read(rb.get(), sink, 10), 10u);

    const std::vector<uint8_t> block = pattern(12, 1);
    EXPECT_EQ(kova_ringbuffer_write(rb.get(), block.data(), 12), 12u);
    EXPECT_EQ(rb->writeIdx, 6u);
    // Bytes 10..15 of storage hold the first six, bytes 0..5 the other six.
    EXPECT_TRUE(std::equal(block.begin(), block.begin() + 6, rb->buf + 10));
    EXPECT_TRUE(std::equal(block.begin() + 6, block.end(), rb->buf));
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 12u);
    EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), 3u);

    std::vector<uint8_t> out(12);
    EXPECT_EQ(kova_ringbuffer_read(rb.get(), out.data(), 12), 12u);
    EXPECT_EQ(out, block);
    EXPECT_EQ(rb->readIdx, 6u);
}

TEST(RingBuffer, ShortReadTakesWhatIsThere) {
    Ring rb(kova_ringbuffer_create(32));
    const uint8_t four[4] = {1, 2, 3, 4};
    kova_ringbuffer_write(rb.get(), four, 4);
    uint8_t out[10] = {};
    EXPECT_EQ(kova_ringbuffer_read(rb.get(), out, 10), 4u);
    EXPECT_EQ(0, memcmp(out, four, 4));
    EXPECT_EQ(out[4], 0);
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 0u);
    EXPECT_EQ(kova_ringbuffer_read(rb.get(), out, 10), 0u);
}

TEST(RingBuffer, ResetEmptiesAndZeroesStorage) {
    Ring rb(kova_ringbuffer_create(64));
    const std::vector<uint8_t> block = pattern(50, 1);
    uint8_t out[20];
    kova_ringbuffer_write(rb.get(), block.data(), 50);
    kova_ringbuffer_read(rb.get(), out, 20);
    kova_ringbuffer_reset(rb.get());
    EXPECT_EQ(rb->readIdx, 0u);
    EXPECT_EQ(rb->writeIdx, 0u);
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 0u);
    EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), 63u);
    EXPECT_TRUE(std::all_of(rb->buf, rb->buf + 64, [](uint8_t b) { return b == 0; }));
}

TEST(RingBuffer, NullArgumentsAreHarmless) {
    uint8_t byte = 9;
    EXPECT_EQ(kova_ringbuffer_read_space(nullptr), 0u);
    EXPECT_EQ(kova_ringbuffer_write_space(nullptr), 0u);
    EXPECT_EQ(kova_ringbuffer_read(nullptr, &byte, 1), 0u);
    EXPECT_EQ(kova_ringbuffer_write(nullptr, &byte, 1), 0u);
    kova_ringbuffer_reset(nullptr);
    kova_ringbuffer_free(nullptr);

    Ring rb(kova_ringbuffer_create(8));
    EXPECT_EQ(kova_ringbuffer_write(rb.get(), nullptr, 4), 0u);
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 0u);
}

// Random writes and reads against a plain queue: contents, order and both spaces must agree at
// every step, across many wraps.
TEST(RingBuffer, AgreesWithAQueueUnderRandomTraffic) {
    Ring rb(kova_ringbuffer_create(256));
    std::deque<uint8_t> model;
    std::srand(12345);
    uint8_t next = 0;
    std::vector<uint8_t> buf(300);
    for (int step = 0; step < 5000; ++step) {
        const uint32_t len = static_cast<uint32_t>(std::rand() % 300);
        if (std::rand() % 2) {
            for (uint32_t i = 0; i < len; ++i) buf[i] = static_cast<uint8_t>(next + i);
            const uint32_t stored = kova_ringbuffer_write(rb.get(), buf.data(), len);
            ASSERT_EQ(stored, std::min<uint32_t>(len, 255 - model.size()));
            for (uint32_t i = 0; i < stored; ++i) model.push_back(buf[i]);
            next = static_cast<uint8_t>(next + stored);
        } else {
            const uint32_t got = kova_ringbuffer_read(rb.get(), buf.data(), len);
            ASSERT_EQ(got, std::min<uint32_t>(len, model.size()));
            for (uint32_t i = 0; i < got; ++i) {
                ASSERT_EQ(buf[i], model.front());
                model.pop_front();
            }
        }
        ASSERT_EQ(kova_ringbuffer_read_space(rb.get()), model.size());
        ASSERT_EQ(kova_ringbuffer_write_space(rb.get()), 255u - model.size());
    }
}

}  // namespace
