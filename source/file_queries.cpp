// SPDX-License-Identifier: Apache-2.0
// Queries that read single items out of a saved source-set file, without an engine.
//
// Results: 0 once the file was opened; -3 for a null path or output, or a file that cannot be
// opened (or no memory to open it); -2 (filter query) when memory for the working descriptor ran
// out. The file is read as its layout says: positions follow the bytes each read returned, any
// stored filter count is followed (the loop over descriptors stops where the file ends), and a
// record read in part counts, with zeros where the file ended. Records not reached at all leave
// the outputs they would fill as the caller set them.
#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstring>

#include "kova/kova_source.h"
#include "source/filter_dsc.h"
#include "source/source_io.h"
#include "util/byte_time.h"
#include "util/kova_mem.h"

using namespace kova_source;

namespace {

const char* printable(const char* path) {
    return path != nullptr ? path : "(null)";
}

// The open file and the position of the records after the filter descriptors.
struct QueryFile {
    MfalFile file;
    int32_t count = 0;        // filter count, 0 when unreadable or negative
    int64_t after_count = 0;  // bytes the count read returned

    // False (-3 for the caller) when the file cannot be opened.
    bool open(const char* path) {
        if (!file.open(path, 0)) return false;
        int32_t stored = 0;
        const int r = _read_flt_size(file.handle(), file.mfal(), &stored);
        if (r >= 1) count = stored > 0 ? stored : 0;  // a count read in part has zero high bytes
        after_count = r > 0 ? r : 0;
        return true;
    }
    // Descriptors the file can hold after the count: reading more would only return nothing.
    int64_t descriptors_held() {
        int64_t size = 0;
        if (file.mfal()->getsize(file.handle(), &size) != 0) return 0;
        return (size - after_count + kFltDscBytes - 1) / kFltDscBytes;
    }
    int64_t tune_offset() const { return after_count + int64_t{kFltDscBytes} * count; }
    bool seek(int64_t pos) { return file.mfal()->setpos(file.handle(), &pos) == 0; }
    int read(void* buf, int len) { return file.mfal()->read(file.handle(), buf, len); }
};

// The stored source records, walked in slot order as the set reader walks them.
struct SourceWalk {
    KOVA_SRC_INFO info{{0, 0, 0}, 48000, 2};
    int64_t pos = 0;
    bool lost = false;  // once a record is unreadable, later ones cannot be located

    explicit SourceWalk(QueryFile& q) : q_(q) {
        const int64_t at = q.tune_offset() + kTuneSetBytes;
        if (!q.seek(at)) {
            lost = true;
            return;
        }
        KOVA_SRC_INFO stored{};
        const int r = q.read(&stored, kSrcInfoBytes);
        if (r == kSrcInfoBytes) info = stored;
        pos = at + (r > 0 ? r : 0);
    }

    // Reads the next stored record (at least 1 byte of it; the rest reads as 0); on success
    // `payload` is its payload's offset and the walk moves on by the stored size, which may be
    // negative. Positions stay within what a 32-bit offset can report.
    bool next(KOVA_SRC* record, int32_t* payload) {
        if (lost || pos < 0 || !q_.seek(pos)) return fail();
        unsigned char image[kSrcRecordBytes] = {};
        const int r = q_.read(image, kSrcRecordBytes);
        if (r < 1) return fail();
        // The reference words (addresses when it was written) are not read.
        *record = KOVA_SRC{};
        record->size = load<int32_t>(image, kSrcSizeAt);
        record->rpt_start = load<int32_t>(image, kSrcRptStartAt);
        record->rpt_end = load<int32_t>(image, kSrcRptEndAt);
        pos += r;
        if (pos > INT32_MAX) return fail();
        *payload = static_cast<int32_t>(pos);
        pos += record->size;
        lost = pos > INT32_MAX || pos < 0;  // the next record has no 32-bit offset
        return true;
    }

   private:
    bool fail() {
        lost = true;
        return false;
    }
    QueryFile& q_;
};

}  // namespace

extern "C" {

KOVA_API int kova_get_pcminfo_fromfile(const char* path, int* start_off, int* start_size,
                                       int* loop_off, int* loop_size, int* end_off, int* end_size) {
    int* offs[KOVA_SLOT_COUNT] = {start_off, loop_off, end_off};
    int* sizes[KOVA_SLOT_COUNT] = {start_size, loop_size, end_size};
    if (path == nullptr) return KOVA_ERR_INVALID_PARAM;
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        if (offs[slot] == nullptr || sizes[slot] == nullptr) return KOVA_ERR_INVALID_PARAM;
    }
    QueryFile q;
    if (!q.open(path)) return KOVA_ERR_INVALID_PARAM;
    SourceWalk walk(q);
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        if (walk.info.has_src[slot] != 1) continue;
        KOVA_SRC record;
        int32_t payload = 0;
        if (!walk.next(&record, &payload)) continue;
        *offs[slot] = payload;
        *sizes[slot] = record.size;
    }
    return KOVA_OK;
}

KOVA_API int kova_get_filters_fromfile(const char* path, KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT]) {
    if (path == nullptr || flt == nullptr) return KOVA_ERR_INVALID_PARAM;
    QueryFile q;
    if (!q.open(path)) return KOVA_ERR_INVALID_PARAM;
    // Descriptors are read a batch at a time: the same bytes as one read per descriptor (the
    // file is read straight on), without a system call for each of a large count.
    constexpr int64_t kBatch = 64;
    auto* batch = static_cast<unsigned char*>(kova_mem_malloc(kBatch * kFltDscBytes));
    if (batch == nullptr) return KOVA_ERR_INSUFF_MEM;
    // Past the end of the file every read returns nothing, so the loop stops there.
    for (int64_t left = std::min<int64_t>(q.count, q.descriptors_held()); left > 0;) {
        const int64_t n = std::min(left, kBatch);
        const int got = q.read(batch, static_cast<int>(n * kFltDscBytes));
        if (got < 1) break;
        for (int64_t k = 0; k * kFltDscBytes < got; ++k) {
            // A descriptor read in part counts (zeros where the file ended); its type names the
            // element, and a later one of the same type replaces an earlier one.
            KOVA_FLT_DSC dsc{};
            std::memcpy(
                &dsc, batch + k * kFltDscBytes,
                static_cast<size_t>(std::min<int64_t>(kFltDscBytes, got - k * kFltDscBytes)));
            if (filter_dsc_ok(&dsc, FilterUse::kType)) std::memcpy(&flt[dsc.type], &dsc, sizeof dsc);
        }
        if (got < n * kFltDscBytes) break;  // the end of the file
        left -= n;
    }
    kova_mem_free(batch);
    printf("kova_get_filters_fromfile(%s)\n", path);
    return KOVA_OK;
}

KOVA_API int kova_get_tuneset_fromfile(const char* path, KOVA_TUNE_SET* tune) {
    QueryFile q;
    if (path == nullptr || tune == nullptr || !q.open(path)) {
        printf("kova_get_tuneset_fromfile(%s) failed \n", printable(path));
        return KOVA_ERR_INVALID_PARAM;
    }
    if (q.seek(q.tune_offset())) {
        _read_KOVA_TUNE_SET(q.file.handle(), q.file.mfal(), tune);
    }
    // The same adjustment as when the set is registered from this file.
    if (!(tune->file_gain > 0.0) && !std::isnan(tune->file_gain)) {
        tune->file_gain = tune->wn_gain;
    }
    tune->wn_gain = 0.0;
    printf("kova_get_tuneset_fromfile(%s)\n", path);
    return KOVA_OK;
}

KOVA_API int kova_get_rptinfo_fromfile(const char* path, KOVA_RPT_INFO* info) {
    if (path == nullptr || info == nullptr) return KOVA_ERR_INVALID_PARAM;
    QueryFile q;
    if (!q.open(path)) return KOVA_ERR_INVALID_PARAM;
    SourceWalk walk(q);
    // The stored format converts as it stands: _cvt_byte_to_ms answers 0 for a format without
    // samples per second instead of dividing by zero.
    const int32_t rate = walk.info.samplerate;
    const int32_t channels = walk.info.channels;
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        if (walk.info.has_src[slot] != 1) {
            info->len_ms[slot] = 0;
            info->rpt_start_ms[slot] = -1;
            info->rpt_end_ms[slot] = -1;
            continue;
        }
        KOVA_SRC record;
        int32_t payload = 0;
        if (!walk.next(&record, &payload)) continue;  // later present slots keep their values
        info->rpt_start_ms[slot] =
            static_cast<int32_t>(kova::byte_to_ms(record.rpt_start, rate, channels));
        info->rpt_end_ms[slot] =
            static_cast<int32_t>(kova::byte_to_ms(record.rpt_end, rate, channels));
        info->len_ms[slot] = kova::byte_to_ms(record.size, rate, channels);
    }
    return KOVA_OK;
}

}  // extern "C"
