// SPDX-License-Identifier: Apache-2.0
// An arbitrary source-set file (the input in the chunk language of file_script.h) through the four
// engine-less queries, then registered as a source set, played with a short stroke, saved and
// registered again; then the filter query and the registration again with an allocation failure
// injected somewhere along the way.
//
// Properties: no crash, leak or undefined behaviour; every query on an existing file answers 0
// (or -2 when memory runs out); outputs of absent items stay as the caller set them; the tune set
// equals the record decoded here from the raw bytes (the caller's bytes where the file ends),
// with the gain adjustment applied; a registration either succeeds with identifier 1 and error 0
// or fails with a documented code and registers nothing; a registered set holds only filters of
// a known type for at most 8 channels and sounds within their slot's limit, with repeat points
// within the sound;
// every generation result is a whole byte count within the buffer; a saved set reads back to a
// set that saves to the very same bytes.
#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "file_script.h"
#include "fuzz_support.h"
#include "util/kova_mem.h"

using namespace kova_fuzz;

namespace {

void check_tuneset(const char* path, const uint8_t* data, size_t size) {
    KOVA_TUNE_SET tune;
    std::memset(&tune, 0x5A, sizeof tune);
    const KOVA_TUNE_SET before = tune;
    FUZZ_CHECK(kova_get_tuneset_fromfile(path, &tune) == KOVA_OK);
    if (size < 4) return;
    int32_t n = 0;
    std::memcpy(&n, data, sizeof n);  // the files are little-endian, as the fuzzing machine
    const int64_t at = 4 + 40 * static_cast<int64_t>(n > 0 ? n : 0);
    KOVA_TUNE_SET stored = before;
    if (static_cast<uint64_t>(at) < size) {
        const size_t held = std::min<size_t>(sizeof stored, size - static_cast<size_t>(at));
        std::memcpy(&stored, data + at, held);
    }
    if (!(stored.file_gain > 0.0) && !std::isnan(stored.file_gain))
        stored.file_gain = stored.wn_gain;
    stored.wn_gain = 0.0;
    FUZZ_CHECK(same_tune(tune, stored));
}

void check_pcminfo(const char* path, size_t size) {
    // Two runs with different presets: an output the query wrote is the same in both, one it
    // left alone still holds its preset.
    constexpr int kPreset[2] = {-7, 0x7EADBEEF};
    int out[2][6];
    for (int run = 0; run < 2; ++run) {
        for (int& v : out[run]) v = kPreset[run];
        int* o = out[run];
        const int rc = kova_get_pcminfo_fromfile(path, &o[0], &o[1], &o[2], &o[3], &o[4], &o[5]);
        FUZZ_CHECK(rc == KOVA_OK);
    }
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        const int* a = &out[0][2 * slot];
        const int* b = &out[1][2 * slot];
        const bool written = a[0] == b[0];
        FUZZ_CHECK(written == (a[1] == b[1]));  // a slot's two outputs go together
        // A payload starts after at least one byte of its record, within the file (a negative
        // stored size may move the next record back, but never before the start).
        FUZZ_CHECK(written ? a[0] >= 1 && static_cast<size_t>(a[0]) <= size
                           : a[0] == kPreset[0] && b[0] == kPreset[1]);
    }
}

void check_filters(const char* path) {
    KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT];
    std::memset(flt, 0, sizeof flt);
    for (auto& d : flt) d.type = 99;  // marks an element the query did not write
    const int rc = kova_get_filters_fromfile(path, flt);
    FUZZ_CHECK(rc == KOVA_OK || rc == KOVA_ERR_INSUFF_MEM);
    for (uint32_t i = 0; i < KOVA_FLT_TYPE_COUNT; ++i)
        FUZZ_CHECK(flt[i].type == 99 || flt[i].type == i);
}

void check_rptinfo(const char* path) {
    KOVA_RPT_INFO info;
    std::memset(&info, 0, sizeof info);
    FUZZ_CHECK(kova_get_rptinfo_fromfile(path, &info) == KOVA_OK);
}

// A registration either gives identifier 1 and error 0 or fails with a documented code and
// registers nothing. Returns whether it succeeded.
bool registered(KOVA_CTX* ctx, const char* path) {
    int32_t err = 0;
    const int32_t id = kova_reg_src_bysavefile(ctx, path, &err);
    if (id == 0) {
        FUZZ_CHECK(err == KOVA_ERR_INVALID_PARAM || err == KOVA_ERR_INSUFF_MEM ||
                   err == KOVA_ERR_SOURCE);
        FUZZ_CHECK(kova_get_src_num(ctx) == 0);
    } else {
        FUZZ_CHECK(id == 1 && err == KOVA_OK && kova_get_src_num(ctx) == 1);
    }
    return id != 0;
}

void play_and_resave(KOVA_CTX* ctx, const ScratchFile& saved, const ScratchFile& resaved) {
    KOVA_TUNE_SET tune{};
    FUZZ_CHECK(kova_get_tuneset(ctx, 1, &tune) == KOVA_OK);
    FUZZ_CHECK(tune.wn_gain == 0.0);  // sources read back are file sources: no noise level
    KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT];
    for (auto& d : flt) d.type = 99;  // marks an element the call did not write
    kova_get_filters(ctx, 1, flt);
    for (uint32_t i = 0; i < KOVA_FLT_TYPE_COUNT; ++i)  // a filter keeps state per channel
        FUZZ_CHECK(flt[i].type == 99 || (flt[i].type == i && flt[i].channels <= 8));
    KOVA_RPT_INFO rpt{};
    FUZZ_CHECK(kova_get_rptinfo(ctx, 1, &rpt) == KOVA_OK);
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {  // within the sound; -1 when absent
        FUZZ_CHECK(rpt.len_ms[slot] <= (slot == KOVA_SLOT_LOOP ? 1000 : 200));  // slot limits
        FUZZ_CHECK(-1 <= rpt.rpt_start_ms[slot] && rpt.rpt_start_ms[slot] <= rpt.len_ms[slot]);
        FUZZ_CHECK(-1 <= rpt.rpt_end_ms[slot] && rpt.rpt_end_ms[slot] <= rpt.len_ms[slot]);
    }
    FUZZ_CHECK(kova_set_active_src(ctx, 1) == KOVA_OK);
    short_stroke(ctx);

    // A saved set, registered again, must save to the very same bytes.
    saved.remove();
    resaved.remove();
    FUZZ_CHECK(kova_save_source(ctx, 1, saved.path()) >= 0);
    int32_t err = 0;
    FUZZ_CHECK(kova_reg_src_bysavefile(ctx, saved.path(), &err) == 2 && err == KOVA_OK);
    FUZZ_CHECK(kova_save_source(ctx, 2, resaved.path()) >= 0);

    // Reading moves a file_gain of 0 or less (not NaN) to the stored wn_gain, which a saved set
    // always holds as 0.0: the one field a second reading may still change.
    KOVA_TUNE_SET expected = tune;
    if (!(expected.file_gain > 0.0) && !std::isnan(expected.file_gain)) expected.file_gain = 0.0;
    KOVA_TUNE_SET tune2{};
    FUZZ_CHECK(kova_get_tuneset(ctx, 2, &tune2) == KOVA_OK);
    FUZZ_CHECK(same_tune(tune2, expected));

    std::string first = saved.read();
    int32_t filters = 0;
    FUZZ_CHECK(first.size() >= sizeof filters);
    std::memcpy(&filters, first.data(), sizeof filters);
    FUZZ_CHECK(filters >= 0);  // a file may hold several descriptors of one type
    const size_t gain_at =
        4 + 40 * static_cast<size_t>(filters) + offsetof(KOVA_TUNE_SET, file_gain);
    FUZZ_CHECK(gain_at + sizeof(double) <= first.size());
    std::memcpy(&first[gain_at], &expected.file_gain, sizeof(double));
    FUZZ_CHECK(first == resaved.read());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const ScratchFile input("srcset-in");
    static const ScratchFile saved("srcset-saved");
    static const ScratchFile resaved("srcset-resaved");
    const std::vector<uint8_t> file = expand_file(data, size);
    input.rewrite(file.data(), file.size());
    check_tuneset(input.path(), file.data(), file.size());
    check_pcminfo(input.path(), file.size());
    check_filters(input.path());
    check_rptinfo(input.path());
    {
        const ScopedCtx engine(kPhoneFormat);
        FUZZ_CHECK(engine.get() != nullptr);
        if (registered(engine.get(), input.path())) play_and_resave(engine.get(), saved, resaved);
    }
    // The same file with the n-th allocation failing (n taken from the input): a failure is
    // reported as such and leaves the context as it was. No memory to open the file is reported
    // as an unusable argument by the filter query.
    if (size > 0) {
        KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT] = {};
        kova_mem_fail_after(static_cast<long>(data[0] % 4));
        const int rc = kova_get_filters_fromfile(input.path(), flt);
        kova_mem_fail_after(-1);
        FUZZ_CHECK(rc == KOVA_OK || rc == KOVA_ERR_INVALID_PARAM || rc == KOVA_ERR_INSUFF_MEM);
        const ScopedCtx engine(kPhoneFormat);
        kova_mem_fail_after(static_cast<long>(data[size - 1] % 16));
        const bool ok = registered(engine.get(), input.path());
        kova_mem_fail_after(-1);
        if (ok) short_stroke(engine.get());
    }
    return 0;
}
