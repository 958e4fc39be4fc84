// SPDX-License-Identifier: Apache-2.0
// Saving a registered source set to a source-set file.
#include <cstring>

#include "engine/context_access.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"
#include "util/kova_mem.h"

namespace {
// Access-object open mode: read-write, created with 0644 if missing, never truncated.
constexpr int kOpenForWriting = 1;
}  // namespace

extern "C" KOVA_API int32_t kova_save_source(KOVA_CTX* ctx, int32_t index, const char* path) {
    // A null path is an invalid argument, reported like a bad identifier.
    if (!_ctx_alive(ctx) || !_srcset_index_ok(ctx, index) || path == nullptr) {
        return KOVA_ERR_INVALID_PARAM;
    }
    KovaCtxLock lock(ctx);  // held until the file is closed
    KOVA_SRCSET* set = _fetch_srcset(ctx, index);
    if (set == nullptr) return KOVA_ERR_INVALID_PARAM;

    // The access object gets a fresh 512-byte path buffer; it refuses paths of 512 bytes or more.
    TARQ_MFAL mfal;
    if (tarq_mfal_init(path, &mfal) != 0) {
        kova_mem_free(mfal.path);
        return KOVA_ERR_SOURCE;
    }
    void* handle = mfal.open(&mfal, kOpenForWriting);
    if (handle == nullptr) {
        kova_mem_free(mfal.path);
        return KOVA_ERR_SOURCE;
    }
    const int32_t written =
        kova_write_srcset(static_cast<int>(ctx->format->sample_rate),
                          static_cast<int>(ctx->format->channels), set, &mfal, handle);
    mfal.close(handle);
    kova_mem_free(mfal.path);
    std::memset(&mfal, 0, sizeof(mfal));
    return written;
}
