// SPDX-License-Identifier: Apache-2.0
// Writing a whole source set to a file and reading it back.
//
// A source-set file comes from outside and may be truncated, corrupted or hostile. The reader
// reads it as its layout says, and is stricter only where the plain reading would be unsafe
// (docs/reliability.md lists each case and why):
//  - a filter count above kMaxStoredFilters refuses the file (-3) before the set is touched; a
//    negative count means no filters;
//  - a descriptor read in part is appended with zeros where the file ended (it is cleared
//    first); descriptors of a type of 4 or more, or for more than kMaxStoredChannels channels,
//    are dropped;
//  - a tune set cut short keeps what the record held before where the file ends;
//  - a source record read in part is used (cleared first); a stored size below 0 leaves the
//    slot empty; a payload above the slot's limit (38400/192000/38400 bytes) is cut there and
//    the rest skipped; a payload cut by the end of the file is kept as far as it was read;
//  - repeat points are kept within the payload, the play position is 0 and the reference words
//    are never used; the stored slot field keeps its value (nothing indexes by it).
//
// kova_open_source results:
//   0  the set is filled;
//  -3  unusable arguments (null set, list, tune set or path; a set that is not empty: a slot
//      already holds a source or the filter list is not empty), a path of 512 characters or
//      more, no memory to open the file, the file cannot be opened, or a stored filter count
//      above kMaxStoredFilters. The set is left exactly as it was given;
//  -2  memory ran out for a filter descriptor, its list node or a source. What was read so
//      far stays in the set, which the caller releases with kova_free_sourceset.
#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstring>

#include "kova/kova_dsp.h"
#include "kova/kova_list.h"
#include "kova/kova_source.h"
#include "source/filter_dsc.h"
#include "source/source_io.h"
#include "util/kova_mem.h"

using namespace kova_source;

namespace kova_source {

// The reference words are never used, the payload is bounded by `max_bytes` and by what the
// file holds, and the repeat points are kept within the payload actually held.
KOVA_SRC* read_src_record(void* h, TARQ_MFAL* mfal, int32_t max_bytes, SrcReadStatus* status) {
    *status = SrcReadStatus::kUnusable;
    if (h == nullptr || mfal == nullptr || max_bytes < 1) return nullptr;

    auto* src = static_cast<KOVA_SRC*>(kova_mem_calloc(1, sizeof(KOVA_SRC)));
    if (src == nullptr) {
        *status = SrcReadStatus::kNoMemory;
        return nullptr;
    }
    auto drop = [&](SrcReadStatus why) -> KOVA_SRC* {
        *status = why;
        kova_free_sourceobj(src);  // only buffers allocated here are ever in src
        return nullptr;
    };

    // A record read in part is used: the fields the file did not reach stay 0.
    unsigned char image[kSrcRecordBytes] = {};
    if (mfal->read(h, image, kSrcRecordBytes) < 1) return drop(SrcReadStatus::kUnusable);
    const auto stored_size = load<int32_t>(image, kSrcSizeAt);
    src->pos = load<int32_t>(image, kSrcPosAt);
    src->slot = load<int32_t>(image, kSrcSlotAt);
    src->origin = KOVA_ORIGIN_SAVEFILE;
    // No buffer has a negative size: such a record is not used.
    if (stored_size < 0) return drop(SrcReadStatus::kUnusable);

    // An oversized payload is cut at the limit, like an over-long PCM file; the rest is skipped
    // so the next record is still found where the writer put it. Buffers get at least one byte
    // so that an empty payload is not mistaken for memory running out.
    const int32_t keep = std::min(stored_size, max_bytes);
    src->pcm = static_cast<int16_t*>(kova_mem_malloc(static_cast<size_t>(std::max(keep, 1))));
    if (src->pcm == nullptr) return drop(SrcReadStatus::kNoMemory);
    const int read = keep > 0 ? mfal->read(h, src->pcm, keep) : 0;
    const int got = read > 0 ? read : 0;
    if (got == keep && stored_size > keep) {
        const int64_t rest = static_cast<int64_t>(stored_size) - keep;
        mfal->skip(h, &rest);
    }
    // A payload cut short by the end of the file is kept as far as it was read; the bytes
    // beyond `got` were never written and are not part of the source.
    src->size = got;

    src->pcm_proc = static_cast<int16_t*>(kova_mem_malloc(static_cast<size_t>(std::max(got, 1))));
    if (src->pcm_proc == nullptr) return drop(SrcReadStatus::kNoMemory);
    if (got > 0) std::memcpy(src->pcm_proc, src->pcm, static_cast<size_t>(got));

    // Playback trusts the repeat points to lie within the samples.
    src->rpt_start = std::clamp(load<int32_t>(image, kSrcRptStartAt), 0, got);
    src->rpt_end = std::clamp(load<int32_t>(image, kSrcRptEndAt), 0, got);
    *status = SrcReadStatus::kOk;
    return src;
}

}  // namespace kova_source

extern "C" {

KOVA_API KOVA_SRC* _read_KOVA_SRC(void* h, TARQ_MFAL* mfal) {
    // Without the slot's position, the largest slot limit bounds what one record may allocate.
    SrcReadStatus status;
    return read_src_record(h, mfal, kLargestSlotBytes, &status);
}

KOVA_API int kova_write_srcset(int sample_rate, int channels, KOVA_SRCSET* set, TARQ_MFAL* mfal,
                               void* h) {
    // Nothing can be written without a set or a file: the sum of no writes is 0.
    if (set == nullptr || mfal == nullptr || h == nullptr) return 0;
    int64_t sum = 0;
    const LIST* filters = set->filters;
    const uint32_t count = filters != nullptr ? filters->count : 0;
    sum += _write_flt_size(h, mfal, static_cast<int32_t>(count));
    if (count >= 1) {
        for (NODE* node = filters->head->next; node != filters->tail; node = node->next) {
            // A missing descriptor is stored as a disabled zero record so the count stays true.
            static const KOVA_FLT_DSC kNone{};
            const auto* dsc = static_cast<const KOVA_FLT_DSC*>(node->data);
            sum += _write_KOVA_FLT_DSC(h, mfal, dsc != nullptr ? dsc : &kNone);
        }
    }
    if (set->tune != nullptr) sum += _write_KOVA_TUNE_SET(h, mfal, set->tune);

    KOVA_SRC_INFO info{};
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) info.has_src[slot] = set->src[slot] ? 1 : 0;
    info.samplerate = sample_rate;
    info.channels = channels;
    sum += _write_KOVA_SRC_INFO(h, mfal, &info);

    for (const KOVA_SRC* src : set->src) {
        if (src != nullptr) sum += _write_KOVA_SRC(h, mfal, src);
    }
    return static_cast<int32_t>(sum);
}

KOVA_API int kova_open_source(KOVA_SRCSET* set, const char* path) {
    if (set == nullptr || set->filters == nullptr || set->tune == nullptr || path == nullptr) {
        return KOVA_ERR_INVALID_PARAM;
    }
    // Filling a set that already holds sources would leak them; one with filters would mix
    // two files. Both are refused untouched.
    if (set->filters->count != 0) return KOVA_ERR_INVALID_PARAM;
    for (const KOVA_SRC* src : set->src) {
        if (src != nullptr) return KOVA_ERR_INVALID_PARAM;
    }

    MfalFile file;
    if (!file.open(path, 0)) return KOVA_ERR_INVALID_PARAM;
    void* h = file.handle();
    TARQ_MFAL* m = file.mfal();

    int32_t count = 0;
    // A count read in part keeps zero high bytes.
    if (_read_flt_size(h, m, &count) < 1) count = 0;
    if (count > kMaxStoredFilters) return KOVA_ERR_INVALID_PARAM;  // checked before any change

    for (int32_t i = 0; i < count; ++i) {
        auto* dsc = static_cast<KOVA_FLT_DSC*>(kova_mem_calloc(1, sizeof(KOVA_FLT_DSC)));
        if (dsc == nullptr) return KOVA_ERR_INSUFF_MEM;
        // A descriptor read in part keeps zeros where the file ended; one that is not usable
        // (source/filter_dsc.h) is dropped.
        if (_read_KOVA_FLT_DSC(h, m, dsc) < 1 || !filter_dsc_ok(dsc, FilterUse::kStored)) {
            kova_mem_free(dsc);
            continue;
        }
        if (list_pushback(set->filters, dsc) == nullptr) {
            kova_mem_free(dsc);
            return KOVA_ERR_INSUFF_MEM;
        }
    }

    // Read over the record given in: where the file ends, it keeps what it held (the engine
    // hands over a cleared one).
    _read_KOVA_TUNE_SET(h, m, set->tune);
    // Every source read back counts as a file source, which plays at file_gain: a set saved
    // with noise keeps its level through wn_gain.
    KOVA_TUNE_SET* tune = set->tune;
    if (!(tune->file_gain > 0.0) && !std::isnan(tune->file_gain)) tune->file_gain = tune->wn_gain;
    tune->wn_gain = 0.0;

    KOVA_SRC_INFO info{{0, 0, 0}, 48000, 2};
    KOVA_SRC_INFO stored{};
    if (_read_KOVA_SRC_INFO(h, m, &stored) == kSrcInfoBytes) info = stored;

    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        if (info.has_src[slot] != 1) continue;
        SrcReadStatus status;
        KOVA_SRC* src = read_src_record(h, m, slot_max_bytes(slot), &status);
        if (status == SrcReadStatus::kNoMemory) return KOVA_ERR_INSUFF_MEM;
        if (src == nullptr) continue;  // unreadable record: the slot stays empty
        src->pos = 0;
        kova_proc_filters(src->pcm_proc, static_cast<uint32_t>(src->size), set->filters);
        set->src[slot] = src;
    }
    return KOVA_OK;
}

}  // extern "C"
