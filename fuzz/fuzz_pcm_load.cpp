// Raw PCM files of any content and length loaded into every slot, registered as a set of three
// and played.
//
// The input is split into three files: two length bytes choose where the start and end files
// begin (the loop file takes the rest), so each slot sees its own file and lengths cross the
// slot limits of 38400 and 192000 bytes only as far as the input does.
//
// Properties: a load keeps exactly min(file length, slot limit) bytes, identical to the file's
// first bytes, in both copies, with the repeat span covering them; an empty file or a bad slot
// fails with -4 and yields nothing; registration succeeds exactly when the loop file has bytes;
// every generation result is a whole byte count within the buffer; nothing leaks.
#include <cstdint>
#include <cstring>
#include <string>

#include "fuzz_support.h"

using namespace kova_fuzz;

namespace {

constexpr int32_t kSlotLimit[KOVA_SLOT_COUNT] = {KOVA_SLOT_START_MAX_BYTES,
                                                 KOVA_SLOT_LOOP_MAX_BYTES, KOVA_SLOT_END_MAX_BYTES};

void check_load(const ScratchFile& file, const uint8_t* bytes, size_t size) {
    for (int slot = -1; slot <= KOVA_SLOT_COUNT; ++slot) {
        int err = 1;
        KOVA_SRC* src = kova_load_sound_source(file.path(), slot, &err);
        if (slot < 0 || slot >= KOVA_SLOT_COUNT || size == 0) {
            FUZZ_CHECK(src == nullptr && err == KOVA_ERR_SOURCE);
            continue;
        }
        FUZZ_CHECK(src != nullptr && err == KOVA_OK);
        const size_t want = size < static_cast<size_t>(kSlotLimit[slot]) ? size : kSlotLimit[slot];
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
        const size_t want = size < static_cast<size_t>(capacity) ? size : capacity;
        FUZZ_CHECK(got == static_cast<int>(want));
        FUZZ_CHECK(std::memcmp(buf.data(), bytes, want) == 0);
        FUZZ_CHECK(buf.compare(capacity, 8, std::string(8, '\x77')) == 0);
    }
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const ScratchFile files[KOVA_SLOT_COUNT] = {
        ScratchFile("pcm-start"), ScratchFile("pcm-loop"), ScratchFile("pcm-end")};
    Bytes in(data, size);
    // Lengths of the start and end files in 256-byte units plus a remainder: seeds reach every
    // limit while small inputs still make small files.
    size_t len[KOVA_SLOT_COUNT];
    len[KOVA_SLOT_START] = in.take<uint16_t>() % 40000;
    len[KOVA_SLOT_END] = in.take<uint16_t>() % 40000;
    size_t got[KOVA_SLOT_COUNT];
    const uint8_t* part[KOVA_SLOT_COUNT];
    part[KOVA_SLOT_START] = in.span(len[KOVA_SLOT_START], &got[KOVA_SLOT_START]);
    part[KOVA_SLOT_END] = in.span(len[KOVA_SLOT_END], &got[KOVA_SLOT_END]);
    part[KOVA_SLOT_LOOP] = in.span(in.left(), &got[KOVA_SLOT_LOOP]);

    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        files[slot].rewrite(part[slot], got[slot]);
        check_load(files[slot], part[slot], got[slot]);
    }

    Engine engine;
    FUZZ_CHECK(engine.ctx() != nullptr);
    const char* paths[KOVA_SLOT_COUNT] = {files[0].path(), files[1].path(), files[2].path()};
    int32_t err = 0;
    const int32_t id = kova_reg_src_byfiles(engine.ctx(), paths, &err);
    if (got[KOVA_SLOT_LOOP] == 0) {
        FUZZ_CHECK(id == 0 && err == KOVA_ERR_SOURCE && kova_get_src_num(engine.ctx()) == 0);
        return 0;
    }
    FUZZ_CHECK(id == 1 && err == KOVA_OK);
    FUZZ_CHECK(kova_set_active_src(engine.ctx(), 1) == KOVA_OK);

    // A start or end plays the whole sound as far as the buffer holds it.
    const int32_t buffers[] = {960000, 3840, 1, 2, 3};
    for (int32_t bytes : buffers) {
        KOVA_PARAM down{10.0f, 10.0f, 50, 0.0f, KOVA_ACTION_START};
        const int32_t start = checked_gen(engine.ctx(), down, bytes);
        const size_t held = got[KOVA_SLOT_START] < static_cast<size_t>(KOVA_SLOT_START_MAX_BYTES)
                                ? got[KOVA_SLOT_START]
                                : KOVA_SLOT_START_MAX_BYTES;
        const int64_t start_bytes = static_cast<int64_t>(held / 2 * 2);
        FUZZ_CHECK(start == (start_bytes < bytes / 2 * 2 ? start_bytes : bytes / 2 * 2));
    }
    checked_stroke(engine.ctx(), 20, 16, 3840);
    checked_stroke(engine.ctx(), 5, 150, 960000);

    // Replacing the files of the registered set keeps it usable for playing.
    const char* loop_only[KOVA_SLOT_COUNT] = {nullptr, files[KOVA_SLOT_START].path(), nullptr};
    kova_update_src_byfiles(engine.ctx(), 1, loop_only, &err);
    checked_stroke(engine.ctx(), 8, 16, 3840);
    return 0;
}
