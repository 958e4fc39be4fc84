// SPDX-License-Identifier: Apache-2.0
// Registration of a source set read back from a source-set file.
#include "engine/srcset_build.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"

extern "C" KOVA_API int32_t kova_reg_src_bysavefile(KOVA_CTX* ctx, const char* path, int32_t* err) {
    if (err == nullptr) return 0;
    *err = KOVA_ERR_INVALID_PARAM;
    if (!_ctx_alive(ctx) || path == nullptr) return 0;
    // A saved set may come in addition to a full list of file and filter sets.
    return _srcset_register(ctx, KOVA_MAX_SRCSETS_SAVEFILE, err, [&](KOVA_SRCSET* set) {
        // The reader fills the filters, the tune set and the slots. A file without a loop source
        // registers all the same; generation refuses to play such a set.
        *err = kova_open_source(set, path);
        return *err == KOVA_OK;
    });
}
