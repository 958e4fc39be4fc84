// SPDX-License-Identifier: Apache-2.0
/* Single-producer single-consumer byte queue of power-of-two size; one byte always stays free so
 * that equal indices mean empty. No lock inside: the owning stream serialises every call. */
#include <string.h>

#include <bit>
#include <cstdint>

#include "kova/kova_output.h"
#include "util/kova_mem.h"

namespace {

/* The largest storage a 32-bit size can describe as a power of two. */
constexpr uint32_t kMaxRingSize = 0x80000000u;

/* Splits a transfer of n bytes starting at idx into the piece up to the end of storage and the
 * piece that wraps to the start. */
struct Pieces {
    uint32_t first;
    uint32_t second;
};

constexpr Pieces split(uint32_t idx, uint32_t n, uint32_t size, uint32_t mask) {
    if (idx + n <= size) return {n, 0};
    return {size - idx, (idx + n) & mask};
}

/* The two space formulas, shared by the exported queries and by read and write. Exported
 * functions may be replaced by another definition at load time, so the compiler calls them rather
 * than inlining them; read and write use these instead, which saves a call per transfer (it shows
 * at the callback's 768-byte pulls). */
inline uint32_t readable(const KOVA_RINGBUFFER& rb) {
    if (rb.writeIdx > rb.readIdx) return rb.writeIdx - rb.readIdx;
    return (rb.size + rb.writeIdx - rb.readIdx) & rb.mask;
}

inline uint32_t writable(const KOVA_RINGBUFFER& rb) {
    if (rb.readIdx > rb.writeIdx) return rb.readIdx - rb.writeIdx - 1;
    if (rb.readIdx == rb.writeIdx) return rb.size - 1;
    return ((rb.readIdx - rb.writeIdx + rb.size) & rb.mask) - 1;
}

}  // namespace

extern "C" {

KOVA_RINGBUFFER* kova_ringbuffer_create(uint32_t requested) {
    // Above 2^31 no power of two fits in 32 bits; refuse rather than hand out a smaller queue.
    if (requested > kMaxRingSize) return nullptr;
    auto* rb = static_cast<KOVA_RINGBUFFER*>(kova_mem_calloc(1, sizeof(KOVA_RINGBUFFER)));
    if (!rb) return nullptr;
    rb->size = std::bit_ceil(requested < 2u ? 2u : requested);
    rb->mask = rb->size - 1;
    rb->writeIdx = 0;
    rb->readIdx = 0;
    rb->buf = static_cast<uint8_t*>(kova_mem_calloc(rb->size, 1));
    if (!rb->buf) {
        kova_mem_free(rb);
        return nullptr;
    }
    return rb;
}

void kova_ringbuffer_free(KOVA_RINGBUFFER* rb) {
    if (!rb) return;
    if (rb->buf) kova_mem_free(rb->buf);
    kova_mem_free(rb);
}

void kova_ringbuffer_reset(KOVA_RINGBUFFER* rb) {
    if (!rb) return;
    rb->writeIdx = 0;
    rb->readIdx = 0;
    memset(rb->buf, 0, rb->size);
}

uint32_t kova_ringbuffer_read_space(const KOVA_RINGBUFFER* rb) {
    return rb ? readable(*rb) : 0;
}

uint32_t kova_ringbuffer_write_space(const KOVA_RINGBUFFER* rb) {
    return rb ? writable(*rb) : 0;
}

uint32_t kova_ringbuffer_read(KOVA_RINGBUFFER* rb, void* dst, uint32_t len) {
    if (!rb) return 0;
    const uint32_t avail = readable(*rb);
    if (avail == 0 || len == 0) return 0;
    const uint32_t n = avail < len ? avail : len;
    const Pieces p = split(rb->readIdx, n, rb->size, rb->mask);
    auto* out = static_cast<uint8_t*>(dst);
    memcpy(out, rb->buf + rb->readIdx, p.first);
    rb->readIdx = (rb->readIdx + p.first) & rb->mask;
    if (p.second) {
        memcpy(out + p.first, rb->buf + rb->readIdx, p.second);
        rb->readIdx = (rb->readIdx + p.second) & rb->mask;
    }
    return n;
}

uint32_t kova_ringbuffer_write(KOVA_RINGBUFFER* rb, const void* src, uint32_t len) {
    if (!rb || !src) return 0;
    const uint32_t space = writable(*rb);
    if (space == 0 || len == 0) return 0;
    const uint32_t n = space < len ? space : len;
    const Pieces p = split(rb->writeIdx, n, rb->size, rb->mask);
    const auto* in = static_cast<const uint8_t*>(src);
    memcpy(rb->buf + rb->writeIdx, in, p.first);
    rb->writeIdx = (rb->writeIdx + p.first) & rb->mask;
    if (p.second) {
        memcpy(rb->buf, in + p.first, p.second);
        rb->writeIdx = (rb->writeIdx + p.second) & rb->mask;
    }
    return n;
}

}  // extern "C"
