// SPDX-License-Identifier: Apache-2.0
// Raw PCM files of any content and length loaded into every slot, registered as a set of three
// and played.
//
// The input gives each slot's file length (near a slot limit, just past it, or small; see
// file_length) and then the bytes the files are made of, repeated as far as each length needs:
// a short input reaches the limits of 38400, 192000 and 38400 bytes and beyond.
//
// Properties: a load keeps exactly min(file length, slot limit) bytes, identical to the file's
// first bytes, in both copies, with the repeat span covering them; an empty file or a bad slot
// fails with -4 and yields nothing; registration succeeds exactly when the loop file has bytes;
// every generation result is a whole byte count within the buffer; nothing leaks.
#include <algorithm>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "file_script.h"
#include "fuzz_support.h"

using namespace kova_fuzz;

namespace {

constexpr int32_t kSlotLimit[KOVA_SLOT_COUNT] = {KOVA_SLOT_START_MAX_BYTES,
                                                 KOVA_SLOT_LOOP_MAX_BYTES, KOVA_SLOT_END_MAX_BYTES};

// A file length from a mode byte and a value: small (v % 1024) for most modes; 0xFD just below
// the slot's limit, 0xFE just above it, 0xFF anywhere up to twice the limit. Large files come
// from the seeds that ask for them, not from most random mutations.
constexpr uint8_t kBelowLimit = 0xFD, kAboveLimit = 0xFE, kWide = 0xFF;
size_t file_length(uint8_t mode, uint16_t v, int32_t limit) {
    const auto lim = static_cast<size_t>(limit);
    if (mode == kBelowLimit) return lim - v % 64u;
    if (mode == kAboveLimit) return lim + v % 64u;
    if (mode == kWide) return (static_cast<size_t>(v) * 8u) % (2 * lim);
    return v % 1024u;
}

void check_load(const ScratchFile& file, const uint8_t* bytes, size_t size) {
    for (int slot = -1; slot <= KOVA_SLOT_COUNT; ++slot) {
        int err = 1;
        KOVA_SRC* src = kova_load_sound_source(file.path(), slot, &err);
        if (slot < 0 || slot >= KOVA_SLOT_COUNT || size == 0) {
            FUZZ_CHECK(src == nullptr && err == KOVA_ERR_SOURCE);
            continue;
        }
        FUZZ_CHECK(src != nullptr && err == KOVA_OK);
        const size_t want = std::min<size_t>(size, kSlotLimit[slot]);
        FUZZ_CHECK(src->size == static_cast<int32_t>(want));
        FUZZ_CHECK(std::memcmp(src->pcm, bytes, want) == 0);
        FUZZ_CHECK(std::memcmp(src->pcm_proc, bytes, want) == 0);
        FUZZ_CHECK(src->pos == 0 && src->slot == slot && src->origin == KOVA_ORIGIN_FILE);
        FUZZ_CHECK(src->rpt_start == 0 && src->rpt_end == src->size);
        FUZZ_CHECK(src->path != nullptr && std::strcmp(src->path, file.path()) == 0);
        kova_free_sourceobj(src);
    }

    // The plain bounded read: min(file, capacity) bytes, never more.
    for (int capacity : {0, 1, 100, 4097}) {
        std::string buf(static_cast<size_t>(capacity) + 8, '\x77');
        const int got = kova_read_source_file(file.path(), buf.data(), capacity);
        const size_t want = std::min<size_t>(size, capacity);
        FUZZ_CHECK(got == static_cast<int>(want));
        FUZZ_CHECK(want == 0 || std::memcmp(buf.data(), bytes, want) == 0);
        FUZZ_CHECK(buf.compare(capacity, 8, std::string(8, '\x77')) == 0);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const ScratchFile files[KOVA_SLOT_COUNT] = {
        ScratchFile("pcm-start"), ScratchFile("pcm-loop"), ScratchFile("pcm-end")};
    Bytes in(data, size);
    size_t got[KOVA_SLOT_COUNT];
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        const auto mode = in.take<uint8_t>();
        got[slot] = file_length(mode, in.take<uint16_t>(), kSlotLimit[slot]);
    }
    // The rest of the input, repeated; a byte of 0 stands in for an empty rest.
    size_t pattern_len = 0;
    const uint8_t* pattern = in.span(SIZE_MAX, &pattern_len);
    static const uint8_t kZero = 0;
    if (pattern_len == 0) {
        pattern = &kZero;
        pattern_len = 1;
    }
    static std::vector<uint8_t> content[KOVA_SLOT_COUNT];
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        std::vector<uint8_t>& c = content[slot];
        c.resize(got[slot]);
        fill_repeating(c.data(), c.size(), pattern, pattern_len);
        files[slot].rewrite(c.data(), c.size());
        check_load(files[slot], c.data(), c.size());
    }

    const ScopedCtx engine(kPhoneFormat);
    KOVA_CTX* ctx = engine.get();
    FUZZ_CHECK(ctx != nullptr);
    int32_t err = 0;
    const char* paths[KOVA_SLOT_COUNT] = {files[0].path(), files[1].path(), files[2].path()};
    const int32_t id = kova_reg_src_byfiles(ctx, paths, &err);
    if (got[KOVA_SLOT_LOOP] == 0) {
        FUZZ_CHECK(id == 0 && err == KOVA_ERR_SOURCE && kova_get_src_num(ctx) == 0);
        return 0;
    }
    FUZZ_CHECK(id == 1 && err == KOVA_OK);
    FUZZ_CHECK(kova_set_active_src(ctx, 1) == KOVA_OK);

    // A start or end plays the whole sound as far as the buffer holds it.
    const int32_t buffers[] = {960000, 3840, 1, 2, 3};
    const size_t start_bytes = std::min<size_t>(got[KOVA_SLOT_START], KOVA_SLOT_START_MAX_BYTES);
    for (int32_t bytes : buffers) {
        const KOVA_PARAM down{10.0f, 10.0f, 50, 0.0f, KOVA_ACTION_START};
        const int32_t start = checked_gen(ctx, down, bytes);
        FUZZ_CHECK(start == static_cast<int32_t>(std::min<size_t>(start_bytes, bytes) / 2 * 2));
    }
    short_stroke(ctx);

    // Replacing the files of the registered set keeps it usable for playing.
    const char* loop_only[KOVA_SLOT_COUNT] = {nullptr, files[KOVA_SLOT_START].path(), nullptr};
    kova_update_src_byfiles(ctx, 1, loop_only, &err);
    short_stroke(ctx);
    return 0;
}
