#include "builtin_set.h"

#include <kova/kova_engine.h>

#include <algorithm>
#include <string>

#include "builtin_sounds.h"
#include "scratch_dir.h"

namespace kova_tool {
namespace {

constexpr double kFilterHz = 2500.0;
constexpr double kFilterBandHz = 3000.0;

}  // namespace

KOVA_FLT_DSC builtin_filter(const KOVA_FORMAT& format) {
    KOVA_FLT_DSC d{};
    d.type = KOVA_FLT_BANDPASS;
    // Below 10 kHz of rate the band is pulled down with the Nyquist frequency, so low rates still
    // get a band.
    d.freq = std::min(kFilterHz, format.sample_rate * 0.25);
    d.bandwidth = std::min(kFilterBandHz, format.sample_rate * 0.3);
    d.enable = 1;
    d.samplerate = static_cast<int32_t>(format.sample_rate);
    d.channels = static_cast<int32_t>(format.channels);
    return d;
}

void builtin_levels(KOVA_TUNE_SET& tune) {
    // The library's registration levels (wn_gain 0.5, start/end 0.6) with its output volume of
    // 0.8 leave a default render near -15 dBFS; these bring its peak to about -5 dBFS (the loop is
    // held near -15 dBFS by the engine's slew limiter).
    tune.gain = 1.0;
    tune.pan = 0.2; /* a touch in the middle plays at 0.9 on both sides instead of 0.8 */
    tune.wn_gain = 1.0;
    tune.file_gain = 1.0;
    tune.start_gain = 1.0;
    tune.loop_gain = 1.0;
    tune.end_gain = 1.0;
}

int32_t register_builtin_set(KOVA_CTX* ctx, const KOVA_FORMAT& format, int32_t* err) {
    const KOVA_FLT_DSC filter = builtin_filter(format);
    const int32_t id = kova_reg_src_byfilter(ctx, &filter, err);
    if (id == 0) return 0;
    {
        ScratchDir scratch;
        const std::string start = scratch.write(
            "start.pcm",
            builtin_start_sound(format.sample_rate, format.channels, KOVA_SLOT_START_MAX_BYTES));
        const std::string end = scratch.write(
            "end.pcm",
            builtin_end_sound(format.sample_rate, format.channels, KOVA_SLOT_END_MAX_BYTES));
        if (start.empty() || end.empty()) {
            if (err) *err = KOVA_ERR_SOURCE;
            return 0;
        }
        const char* paths[KOVA_SLOT_COUNT] = {start.c_str(), nullptr, end.c_str()};
        if (kova_update_src_byfiles(ctx, id, paths, err) == 0) return 0;
    }
    KOVA_TUNE_SET tune{};
    int32_t rc = kova_get_tuneset(ctx, id, &tune);
    if (rc == KOVA_OK) {
        builtin_levels(tune);
        rc = kova_set_tuneset(ctx, id, &tune);
    }
    if (rc == KOVA_OK) rc = kova_set_active_src(ctx, id);
    if (rc != KOVA_OK) {
        if (err) *err = rc;
        return 0;
    }
    if (err) *err = KOVA_OK;
    return id;
}

}  // namespace kova_tool
