// SPDX-License-Identifier: Apache-2.0
// Internal helpers shared by the PCM loader, the source-set reader/writer and the file queries.
#ifndef KOVA_SOURCE_IO_H
#define KOVA_SOURCE_IO_H

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "kova/kova_types.h"

namespace kova_source {

// Largest PCM length a slot may hold, in bytes; -1 for an index that is not a slot.
constexpr int32_t slot_max_bytes(int slot) {
    switch (slot) {
        case KOVA_SLOT_START:
            return KOVA_SLOT_START_MAX_BYTES;
        case KOVA_SLOT_LOOP:
            return KOVA_SLOT_LOOP_MAX_BYTES;
        case KOVA_SLOT_END:
            return KOVA_SLOT_END_MAX_BYTES;
        default:
            return -1;
    }
}
constexpr int32_t kLargestSlotBytes = KOVA_SLOT_LOOP_MAX_BYTES;

// The set reader's bound on a stored filter count: each descriptor is an allocation and each
// enabled filter runs over every payload, so a count of billions would allocate and work without
// bound. A file above it is refused. (The queries only read descriptors and follow any count.)
constexpr int32_t kMaxStoredFilters = 64;

// Sizes of the records in a source-set file.
constexpr int kCountBytes = 4;
constexpr int kFltDscBytes = 40;
constexpr int kTuneSetBytes = 88;
constexpr int kSrcInfoBytes = 20;
constexpr int kSrcRecordBytes = 48;

// Offsets of the fields of a stored source record: the image of KOVA_SRC on a 64-bit target
// (three 8-byte reference words, then six 32-bit fields). Fixed numbers rather than offsetof, so
// a 32-bit build reads and writes the same files.
constexpr size_t kSrcSizeAt = 24;
constexpr size_t kSrcPosAt = 28;
constexpr size_t kSrcSlotAt = 32;
constexpr size_t kSrcOriginAt = 36;
constexpr size_t kSrcRptStartAt = 40;
constexpr size_t kSrcRptEndAt = 44;
#if UINTPTR_MAX > 0xFFFFFFFFu
static_assert(offsetof(KOVA_SRC, size) == kSrcSizeAt && offsetof(KOVA_SRC, pos) == kSrcPosAt &&
                  offsetof(KOVA_SRC, slot) == kSrcSlotAt &&
                  offsetof(KOVA_SRC, origin) == kSrcOriginAt &&
                  offsetof(KOVA_SRC, rpt_start) == kSrcRptStartAt &&
                  offsetof(KOVA_SRC, rpt_end) == kSrcRptEndAt,
              "a 64-bit KOVA_SRC is the stored record's image");
#endif

// Reads a field of a stored record image at its byte offset.
template <typename T>
T load(const unsigned char* image, size_t offset) {
    T value;
    std::memcpy(&value, image + offset, sizeof(T));
    return value;
}

// Access object plus open handle, closed and released together when the object goes out of
// scope, so no return path can leak the descriptor, the handle cell or the path buffer.
class MfalFile {
   public:
    MfalFile() = default;
    MfalFile(const MfalFile&) = delete;
    MfalFile& operator=(const MfalFile&) = delete;
    ~MfalFile();

    // Fills the access object for `path` and opens it (mode bit 0: read-write, create).
    // False when the path is unusable, memory ran out or the file cannot be opened.
    bool open(const char* path, int mode);

    TARQ_MFAL* mfal() { return &m_; }
    void* handle() const { return h_; }

   private:
    TARQ_MFAL m_{};
    void* h_ = nullptr;
};

// Outcome of reading one stored source record.
enum class SrcReadStatus { kOk, kUnusable, kNoMemory };

// Reads one stored source record and its payload at the current position, keeping at most
// `max_bytes` of the payload. Returns the new source (status kOk) or null with the reason.
KOVA_SRC* read_src_record(void* h, TARQ_MFAL* mfal, int32_t max_bytes, SrcReadStatus* status);

}  // namespace kova_source

#endif
