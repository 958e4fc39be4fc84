// The page's first set: the very same built-in set as `kova render` (the tool's own code).
#include <kova/kova.h>

#include <cstdio>
#include <string>
#include <vector>

#include "builtin_set.h"
#include "builtin_sounds.h"

namespace {

bool write_pcm(const std::string& path, const std::vector<int16_t>& pcm) {
    std::FILE* f = std::fopen(path.c_str(), "wb");
    if (f == nullptr) return false;
    const size_t n = std::fwrite(pcm.data(), sizeof(int16_t), pcm.size(), f);
    return std::fclose(f) == 0 && n == pcm.size();
}

}  // namespace

// Registers the built-in set for the context's format and makes it active. Returns its id, or 0
// with the library's code in *err.
//
// The engine reads a file source again from its path whenever the set's filters change; the
// tool's set takes its start and end sounds from a folder it removes at once, so a filter edited
// in the page would leave both slots empty. The same two sounds are therefore loaded again from
// files that stay in the page's in-memory file system (the set's samples do not change: every
// working copy is rebuilt from the unfiltered samples), and the set's levels are kept.
extern "C" int32_t studio_register_builtin(KOVA_CTX* ctx, int32_t* err) {
    if (ctx == nullptr || ctx->tag != KOVA_CTX_TAG || err == nullptr) return 0;
    const KOVA_FORMAT fmt = *ctx->format;
    const int32_t id = kova_tool::register_builtin_set(ctx, fmt, err);
    if (id == 0) return 0;

    const std::string stem =
        "/studio/builtin-" + std::to_string(fmt.sample_rate) + "-" + std::to_string(fmt.channels);
    const std::string start = stem + "-start.pcm";
    const std::string end = stem + "-end.pcm";
    if (!write_pcm(start, kova_tool::builtin_start_sound(fmt.sample_rate, fmt.channels,
                                                         KOVA_SLOT_START_MAX_BYTES)) ||
        !write_pcm(end, kova_tool::builtin_end_sound(fmt.sample_rate, fmt.channels,
                                                     KOVA_SLOT_END_MAX_BYTES))) {
        *err = KOVA_ERR_SOURCE;
        return 0;
    }
    KOVA_TUNE_SET levels{};
    kova_get_tuneset(ctx, id, &levels);
    const char* paths[KOVA_SLOT_COUNT] = {start.c_str(), nullptr, end.c_str()};
    if (kova_update_src_byfiles(ctx, id, paths, err) == 0) return 0;
    kova_set_tuneset(ctx, id, &levels);
    *err = KOVA_OK;
    return id;
}
