// Queries that read single items out of a saved source-set file, without an engine.
//
// Results: 0 once the file was opened and understood; -3 for a null path or output, a file that
// cannot be opened (or no memory to open it), or a stored filter count above kMaxStoredFilters
// (not a file the library wrote; the set reader refuses it too); -2 (filter query) when memory
// for the working descriptor ran out. Records cut short by the end of the file are treated as
// not there: the outputs they would fill keep what the caller put in them.
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

    // False (-3 for the caller) when the file cannot be opened or its count is not believable.
    bool open(const char* path) {
        if (!file.open(path, 0)) return false;
        int32_t stored = 0;
        const int r = _read_flt_size(file.handle(), file.mfal(), &stored);
        if (r == kCountBytes) count = stored > 0 ? stored : 0;
        after_count = r > 0 ? r : 0;
        return count <= kMaxStoredFilters;
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

    // Reads the next stored record; on success `payload` is its payload's offset and the walk
    // moves past the payload. Positions stay within what a 32-bit offset can report.
    bool next(KOVA_SRC* record, int32_t* payload) {
        if (lost || !q_.seek(pos)) return fail();
        unsigned char image[kSrcRecordBytes];
        const int r = q_.read(image, kSrcRecordBytes);
        if (r != kSrcRecordBytes) return fail();
        // The reference words (addresses when it was written) are not read.
        *record = KOVA_SRC{};
        record->size = load<int32_t>(image, offsetof(KOVA_SRC, size));
        record->rpt_start = load<int32_t>(image, offsetof(KOVA_SRC, rpt_start));
        record->rpt_end = load<int32_t>(image, offsetof(KOVA_SRC, rpt_end));
        pos += r;
        if (record->size < 0 || pos > INT32_MAX) return fail();
        *payload = static_cast<int32_t>(pos);
        pos += record->size;
        lost = pos > INT32_MAX;  // the next record has no 32-bit offset
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
    auto* dsc = static_cast<KOVA_FLT_DSC*>(kova_mem_malloc(sizeof(KOVA_FLT_DSC)));
    if (dsc == nullptr) return KOVA_ERR_INSUFF_MEM;
    for (int32_t i = 0; i < q.count; ++i) {
        *dsc = KOVA_FLT_DSC{};
        // Only the descriptors the set reader would keep name an element; a later one of the
        // same type replaces an earlier one.
        if (_read_KOVA_FLT_DSC(q.file.handle(), q.file.mfal(), dsc) != kFltDscBytes) continue;
        if (!filter_dsc_ok(dsc, FilterUse::kStored)) continue;
        std::memcpy(&flt[dsc->type], dsc, sizeof(KOVA_FLT_DSC));
    }
    kova_mem_free(dsc);
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
    int32_t rate = walk.info.samplerate;
    int32_t channels = walk.info.channels;
    // A stored format the engine cannot run at is not a format: convert with the defaults so
    // no conversion divides by zero or overflows.
    if (rate < 8000 || rate > 48000 || channels < 1 || channels > 2) {
        rate = 48000;
        channels = 2;
    }
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
