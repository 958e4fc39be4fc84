// SPDX-License-Identifier: Apache-2.0
// Loading raw PCM files (no header) into KOVA_SRC records, and a plain bounded file read.
#include <algorithm>
#include <cstring>

#include "kova/kova_source.h"
#include "source/source_io.h"
#include "util/kova_mem.h"

using kova_source::MfalFile;

extern "C" {

KOVA_API KOVA_SRC* kova_load_sound_source(const char* path, int slot, int* err) {
    int ignored = 0;
    int* code = err != nullptr ? err : &ignored;
    *code = KOVA_ERR_SOURCE;
    if (path == nullptr) return nullptr;

    MfalFile file;
    if (!file.open(path, 0)) return nullptr;
    TARQ_MFAL* m = file.mfal();

    auto* src = static_cast<KOVA_SRC*>(kova_mem_calloc(1, sizeof(KOVA_SRC)));
    auto fail = [&](int why) -> KOVA_SRC* {
        *code = why;
        kova_free_sourceobj(src);
        return nullptr;
    };
    if (src == nullptr) return fail(KOVA_ERR_INSUFF_MEM);
    src->path = static_cast<char*>(kova_mem_calloc(1, KOVA_PATH_BUF_BYTES));
    if (src->path == nullptr) return fail(KOVA_ERR_INSUFF_MEM);
    std::memcpy(src->path, m->path, KOVA_PATH_BUF_BYTES);  // already checked to fit

    int64_t file_size = 0;
    if (m->getsize(file.handle(), &file_size) != 0) file_size = 0;

    const int32_t limit = kova_source::slot_max_bytes(slot);
    if (limit < 0) return fail(KOVA_ERR_SOURCE);
    const auto count =
        static_cast<uint32_t>(std::min(static_cast<double>(file_size), static_cast<double>(limit)));
    if (count == 0) return fail(KOVA_ERR_SOURCE);

    src->pcm_proc = static_cast<int16_t*>(kova_mem_malloc(count));
    if (src->pcm_proc == nullptr) return fail(KOVA_ERR_INSUFF_MEM);
    src->pcm = static_cast<int16_t*>(kova_mem_malloc(count));
    if (src->pcm == nullptr) return fail(KOVA_ERR_INSUFF_MEM);

    const int got = m->read(file.handle(), src->pcm, static_cast<int>(count));
    // A read error (-1) is no byte count, and a file that came up empty after getsize holds no
    // samples: both fail like an unusable file, never as a source of 0 or -1 bytes.
    if (got <= 0) return fail(KOVA_ERR_SOURCE);

    std::memcpy(src->pcm_proc, src->pcm, static_cast<size_t>(got));
    src->size = got;
    src->rpt_end = got;
    src->pos = 0;
    src->rpt_start = 0;
    src->slot = slot;
    src->origin = KOVA_ORIGIN_FILE;
    *code = KOVA_OK;
    return src;
}

KOVA_API int kova_read_source_file(const char* path, void* buf, int capacity) {
    // A negative capacity describes no buffer at all: nothing is read, as for a null buffer.
    if (path == nullptr || buf == nullptr || capacity < 0) return 0;
    MfalFile file;
    if (!file.open(path, 0)) return 0;
    TARQ_MFAL* m = file.mfal();
    int64_t file_size = 0;
    if (m->getsize(file.handle(), &file_size) != 0) file_size = 0;
    const int64_t want = std::min<int64_t>(file_size, capacity);
    return m->read(file.handle(), buf, static_cast<int>(want));
}

}  // extern "C"
