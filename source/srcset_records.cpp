// Readers and writers of the records of a source-set file. Each takes the open handle and the
// access object through which it does its I/O. Writers build the stored image in a zeroed buffer,
// so padding bytes and the reference words of a source record are always 0 and a saved file
// depends only on the set's values.
#include <cstddef>
#include <cstring>

#include "kova/kova_source.h"
#include "source/source_io.h"
#include "util/kova_mem.h"

using namespace kova_source;

namespace {

template <typename T>
void put(unsigned char* image, size_t offset, const T& value) {
    std::memcpy(image + offset, &value, sizeof(T));
}

bool usable(void* h, const TARQ_MFAL* m) {
    return h != nullptr && m != nullptr;
}

}  // namespace

extern "C" {

KOVA_API int _write_flt_size(void* h, TARQ_MFAL* mfal, int32_t count) {
    if (!usable(h, mfal)) return -1;
    return mfal->write(h, &count, kCountBytes);
}

KOVA_API int _read_flt_size(void* h, TARQ_MFAL* mfal, int32_t* count) {
    if (!usable(h, mfal) || count == nullptr) return -1;
    const int64_t start = 0;
    if (mfal->setpos(h, &start) != 0) return -1;
    return mfal->read(h, count, kCountBytes);
}

KOVA_API int _write_KOVA_FLT_DSC(void* h, TARQ_MFAL* mfal, const KOVA_FLT_DSC* dsc) {
    if (!usable(h, mfal) || dsc == nullptr) return -1;
    unsigned char image[kFltDscBytes] = {};
    put(image, offsetof(KOVA_FLT_DSC, type), dsc->type);
    put(image, offsetof(KOVA_FLT_DSC, freq), dsc->freq);
    put(image, offsetof(KOVA_FLT_DSC, bandwidth), dsc->bandwidth);
    put(image, offsetof(KOVA_FLT_DSC, enable), dsc->enable);
    put(image, offsetof(KOVA_FLT_DSC, samplerate), dsc->samplerate);
    put(image, offsetof(KOVA_FLT_DSC, channels), dsc->channels);
    return mfal->write(h, image, kFltDscBytes);
}

KOVA_API int _read_KOVA_FLT_DSC(void* h, TARQ_MFAL* mfal, KOVA_FLT_DSC* dsc) {
    if (!usable(h, mfal) || dsc == nullptr) return -1;
    return mfal->read(h, dsc, kFltDscBytes);
}

KOVA_API int _write_KOVA_TUNE_SET(void* h, TARQ_MFAL* mfal, const KOVA_TUNE_SET* tune) {
    if (!usable(h, mfal) || tune == nullptr) return -1;
    unsigned char image[kTuneSetBytes] = {};
    put(image, offsetof(KOVA_TUNE_SET, gain), tune->gain);
    put(image, offsetof(KOVA_TUNE_SET, pan), tune->pan);
    put(image, offsetof(KOVA_TUNE_SET, osc_enable), tune->osc_enable);
    put(image, offsetof(KOVA_TUNE_SET, osc_depth), tune->osc_depth);
    put(image, offsetof(KOVA_TUNE_SET, sharp_enable), tune->sharp_enable);
    put(image, offsetof(KOVA_TUNE_SET, sharpness), tune->sharpness);
    put(image, offsetof(KOVA_TUNE_SET, wn_gain), tune->wn_gain);
    put(image, offsetof(KOVA_TUNE_SET, file_gain), tune->file_gain);
    put(image, offsetof(KOVA_TUNE_SET, start_gain), tune->start_gain);
    put(image, offsetof(KOVA_TUNE_SET, loop_gain), tune->loop_gain);
    put(image, offsetof(KOVA_TUNE_SET, end_gain), tune->end_gain);
    return mfal->write(h, image, kTuneSetBytes);
}

KOVA_API int _read_KOVA_TUNE_SET(void* h, TARQ_MFAL* mfal, KOVA_TUNE_SET* tune) {
    if (!usable(h, mfal) || tune == nullptr) return -1;
    return mfal->read(h, tune, kTuneSetBytes);
}

KOVA_API int _write_KOVA_SRC_INFO(void* h, TARQ_MFAL* mfal, const KOVA_SRC_INFO* info) {
    if (!usable(h, mfal) || info == nullptr) return -1;
    return mfal->write(h, info, kSrcInfoBytes);  // five int32, no padding
}

KOVA_API int _read_KOVA_SRC_INFO(void* h, TARQ_MFAL* mfal, KOVA_SRC_INFO* info) {
    if (!usable(h, mfal) || info == nullptr) return -1;
    return mfal->read(h, info, kSrcInfoBytes);
}

KOVA_API int _write_KOVA_SRC(void* h, TARQ_MFAL* mfal, const KOVA_SRC* src) {
    if (!usable(h, mfal) || src == nullptr) return -1;
    // The three reference words stay 0: addresses mean nothing in a file.
    unsigned char image[kSrcRecordBytes] = {};
    put(image, kSrcSizeAt, src->size);
    put(image, kSrcPosAt, src->pos);
    put(image, kSrcSlotAt, src->slot);
    put(image, kSrcOriginAt, src->origin);
    put(image, kSrcRptStartAt, src->rpt_start);
    put(image, kSrcRptEndAt, src->rpt_end);
    const int head = mfal->write(h, image, kSrcRecordBytes);
    int body = 0;
    if (src->size > 0) {
        // A source claiming samples it does not hold writes none and reports a failed write.
        body = src->pcm != nullptr ? mfal->write(h, src->pcm, src->size) : -1;
    }
    return static_cast<int32_t>(static_cast<int64_t>(head) + body);
}

}  // extern "C"
