// SPDX-License-Identifier: Apache-2.0
#include "source/filter_dsc.h"

#include <cmath>

namespace kova_source {

namespace {

// Highest descriptor rate taken; well above any PCM rate this library handles.
constexpr int32_t kMaxFilterRate = 384000;

}  // namespace

// For a design: a positive rate, a frequency strictly between 0 and Nyquist (tan(pi*f/fs) is 0 or
// infinite at the ends), for the band types also such a bandwidth, no NaN or infinity anywhere.
// The bandwidth of low- and high-pass filters is unused and only has to be finite.
bool filter_dsc_ok(const KOVA_FLT_DSC* dsc, FilterUse use) {
    if (dsc == nullptr || dsc->type >= KOVA_FLT_TYPE_COUNT) return false;
    if (use == FilterUse::kType) return true;
    if (dsc->channels > kMaxStoredChannels) return false;
    if (use == FilterUse::kStored) return true;
    if (dsc->channels < 1 || dsc->channels > 2) return false;
    if (dsc->samplerate <= 0 || dsc->samplerate > kMaxFilterRate) return false;
    if (!std::isfinite(dsc->freq) || !std::isfinite(dsc->bandwidth)) return false;
    const double nyquist = dsc->samplerate / 2.0;
    if (!(dsc->freq > 0.0 && dsc->freq < nyquist)) return false;
    const bool band = dsc->type == KOVA_FLT_BANDPASS || dsc->type == KOVA_FLT_BANDREJECT;
    return !band || (dsc->bandwidth > 0.0 && dsc->bandwidth < nyquist);
}

}  // namespace kova_source
