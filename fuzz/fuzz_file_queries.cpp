// SPDX-License-Identifier: Apache-2.0
// The four engine-less queries on an arbitrary source-set file (the input in the chunk language
// of file_script.h).
//
// Properties: no crash, leak or undefined behaviour; every query on an existing file answers 0
// (or -2 when memory runs out); outputs of absent items stay as the caller set them; the tune
// set equals the record decoded here from the raw bytes (the caller's bytes where the file ends),
// with the gain adjustment applied.
#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
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
        const bool offset_written = out[0][2 * slot] == out[1][2 * slot];
        const bool size_written = out[0][2 * slot + 1] == out[1][2 * slot + 1];
        FUZZ_CHECK(offset_written == size_written);  // a slot's two outputs go together
        if (!offset_written) {
            FUZZ_CHECK(out[0][2 * slot] == kPreset[0] && out[1][2 * slot] == kPreset[1]);
            continue;
        }
        // A payload starts after at least one byte of its record, within the file (a negative
        // stored size may move the next record back, but never before the start).
        const int offset = out[0][2 * slot];
        FUZZ_CHECK(offset >= 1);
        FUZZ_CHECK(static_cast<size_t>(offset) <= size);
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
    FUZZ_CHECK(kova_get_rptinfo_fromfile(path, nullptr) == KOVA_ERR_INVALID_PARAM);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* input, size_t input_size) {
    static const ScratchFile file("queries");
    const std::vector<uint8_t> bytes = expand_file(input, input_size);
    const uint8_t* data = bytes.data();
    const size_t size = bytes.size();
    file.rewrite(data, size);
    check_tuneset(file.path(), data, size);
    check_pcminfo(file.path(), size);
    check_filters(file.path());
    check_rptinfo(file.path());

    // Memory running out in the filter query (its only allocation besides opening the file).
    if (size > 0) {
        KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT] = {};
        kova_mem_fail_after(static_cast<long>(data[0] % 4));
        const int rc = kova_get_filters_fromfile(file.path(), flt);
        kova_mem_fail_after(-1);
        // No memory to open the file is reported as an unusable argument.
        FUZZ_CHECK(rc == KOVA_OK || rc == KOVA_ERR_INVALID_PARAM || rc == KOVA_ERR_INSUFF_MEM);
    }
    return 0;
}
