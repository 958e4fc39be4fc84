// SPDX-License-Identifier: Apache-2.0
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdlib>
#include <deque>
#include <memory>
#include <numeric>
#include <vector>

#include "kova/kova_output.h"
#include "util/kova_mem.h"

namespace {

using Ring = std::unique_ptr<KOVA_RINGBUFFER, decltype(&kova_ringbuffer_free)>;
Ring make_ring(uint32_t requested) {
    return {kova_ringbuffer_create(requested), kova_ringbuffer_free};
}

std::vector<uint8_t> pattern(size_t n, uint8_t first) {
    std::vector<uint8_t> v(n);
    std::iota(v.begin(), v.end(), first);
    return v;
}

TEST(RingBuffer, SizeIsAPowerOfTwoOfAtLeastTwoAndHoldsOneByteLess) {
    const std::pair<uint32_t, uint32_t> cases[] = {{0, 2}, {1, 2},       {2, 2},
                                                   {3, 4}, {4097, 8192}, {384000, 524288}};
    for (auto [requested, size] : cases) {
        Ring rb = make_ring(requested);
        ASSERT_NE(rb, nullptr) << requested;
        EXPECT_EQ(rb->size, size);
        EXPECT_EQ(rb->mask, size - 1);
        const std::vector<uint8_t> block = pattern(size, 3);
        EXPECT_EQ(kova_ringbuffer_write(rb.get(), block.data(), size), size - 1) << requested;
        EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), 0u);
        EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), size - 1);
        EXPECT_EQ(kova_ringbuffer_write(rb.get(), block.data(), 1), 0u);
    }
    // No 32-bit power of two covers these: refused before any allocation.
    const unsigned long before = kova_mem_alloc_count();
    EXPECT_EQ(kova_ringbuffer_create(0x80000001u), nullptr);
    EXPECT_EQ(kova_ringbuffer_create(0xFFFFFFFFu), nullptr);
    EXPECT_EQ(kova_mem_alloc_count(), before);
}

TEST(RingBuffer, WriteAcrossTheEndLandsInTwoPiecesAndReadsBackInOrder) {
    Ring rb = make_ring(16);
    uint8_t scratch[16];
    const std::vector<uint8_t> head = pattern(10, 100);
    kova_ringbuffer_write(rb.get(), head.data(), 10);
    kova_ringbuffer_read(rb.get(), scratch, 10);

    const std::vector<uint8_t> block = pattern(12, 1);
    EXPECT_EQ(kova_ringbuffer_write(rb.get(), block.data(), 12), 12u);
    // Bytes 10..15 of the storage hold the first six, bytes 0..5 the other six.
    EXPECT_TRUE(std::equal(block.begin(), block.begin() + 6, rb->buf + 10));
    EXPECT_TRUE(std::equal(block.begin() + 6, block.end(), rb->buf));
    EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), 3u);

    std::vector<uint8_t> out(20, 0);
    EXPECT_EQ(kova_ringbuffer_read(rb.get(), out.data(), 20), 12u);  // a short read is normal
    out.resize(12);
    EXPECT_EQ(out, block);
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 0u);

    // Reset after use empties the queue and zeroes all storage.
    kova_ringbuffer_write(rb.get(), block.data(), 12);
    kova_ringbuffer_reset(rb.get());
    EXPECT_EQ(kova_ringbuffer_read_space(rb.get()), 0u);
    EXPECT_EQ(kova_ringbuffer_write_space(rb.get()), 15u);
    EXPECT_TRUE(std::all_of(rb->buf, rb->buf + 16, [](uint8_t b) { return b == 0; }));
}

// Random writes and reads against a plain queue: contents, order and both spaces agree at every
// step, across many wraps.
TEST(RingBuffer, AgreesWithAQueueUnderRandomTraffic) {
    Ring rb = make_ring(256);
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
}

}  // namespace
