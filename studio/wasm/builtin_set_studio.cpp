// The page's first set: the same built-in set as `kova render` without options, a band-passed
// noise loop between the tool's synthesised start and end sounds.
#include <kova/kova.h>

#include <algorithm>
#include <cstdio>
#include <string>
#include <vector>

#include "builtin_sounds.h"

namespace {

// The engine registers PCM only from files: the two sounds go through the in-memory file system.
bool write_pcm(const char* path, const std::vector<int16_t>& pcm) {
    std::FILE* f = std::fopen(path, "wb");
    if (f == nullptr) return false;
    const size_t n = std::fwrite(pcm.data(), sizeof(int16_t), pcm.size(), f);
    return std::fclose(f) == 0 && n == pcm.size();
}

}  // namespace

// Registers the built-in set and makes it active. Returns its id, or 0 with the code in *err.
extern "C" int32_t studio_register_builtin(KOVA_CTX* ctx, int32_t* err) {
    if (ctx == nullptr || err == nullptr) return 0;
    const KOVA_FORMAT& fmt = *ctx->format;
    KOVA_FLT_DSC band{};
    band.type = KOVA_FLT_BANDPASS;
    band.freq = std::min(2500.0, fmt.sample_rate * 0.25);
    band.bandwidth = std::min(3000.0, fmt.sample_rate * 0.3);
    band.enable = 1;
    band.samplerate = static_cast<int32_t>(fmt.sample_rate);
    band.channels = static_cast<int32_t>(fmt.channels);
    const int32_t id = kova_reg_src_byfilter(ctx, &band, err);
    if (id == 0) return 0;

    KOVA_TUNE_SET levels{};
    kova_get_tuneset(ctx, id, &levels);
    const char* start = "/tmp/builtin-start.pcm";
    const char* end = "/tmp/builtin-end.pcm";
    if (!write_pcm(start, kova_tool::builtin_start_sound(fmt.sample_rate, fmt.channels,
                                                         KOVA_SLOT_START_MAX_BYTES)) ||
        !write_pcm(end, kova_tool::builtin_end_sound(fmt.sample_rate, fmt.channels,
                                                     KOVA_SLOT_END_MAX_BYTES))) {
        *err = KOVA_ERR_SOURCE;
        return 0;
    }
    const char* paths[KOVA_SLOT_COUNT] = {start, nullptr, end};
    const int32_t updated = kova_update_src_byfiles(ctx, id, paths, err);
    std::remove(start);
    std::remove(end);
    if (updated == 0) return 0;
    // Replacing the start and end sounds must not change how loud the noise loop plays.
    kova_set_tuneset(ctx, id, &levels);
    *err = kova_set_active_src(ctx, id);
    return *err == KOVA_OK ? id : 0;
}
