// The page's first set: the very same built-in set as `kova render` (the tool's own code).
#include <kova/kova.h>

#include "builtin_set.h"

// Registers the built-in set for the context's format and makes it active. Returns its id, or 0
// with the library's code in *err.
extern "C" int32_t studio_register_builtin(KOVA_CTX* ctx, int32_t* err) {
    if (ctx == nullptr || ctx->tag != KOVA_CTX_TAG || err == nullptr) return 0;
    return kova_tool::register_builtin_set(ctx, *ctx->format, err);
}
