// Registration of a source set read back from a source-set file.
#include "engine/engine_internal.h"
#include "kova/kova_engine.h"
#include "kova/kova_source.h"

extern "C" KOVA_API int32_t kova_reg_src_bysavefile(KOVA_CTX* ctx, const char* path, int32_t* err) {
    if (err == nullptr) return 0;
    *err = KOVA_ERR_INVALID_PARAM;
    if (!_ctx_alive(ctx) || path == nullptr) return 0;
    // A saved set may come in addition to a full list of file and filter sets.
    if (_srcset_count(ctx) >= KOVA_MAX_SRCSETS_SAVEFILE) {
        *err = KOVA_ERR_SRC_FULL;
        return 0;
    }

    KovaCtxLock lock(ctx);
    KOVA_SRCSET* set = _srcset_new();
    if (set == nullptr) {
        *err = KOVA_ERR_INSUFF_MEM;
        return 0;
    }

    // The reader fills the filters, the tune set and the slots. A file without a loop source
    // registers all the same; generation refuses to play such a set.
    *err = kova_open_source(set, path);
    if (*err != KOVA_OK) {
        kova_free_sourceset(set);
        return 0;
    }

    const int32_t id = _srcset_append(ctx, set);
    if (id == 0) {
        *err = KOVA_ERR_INSUFF_MEM;
        kova_free_sourceset(set);
        return 0;
    }
    return id;
}
