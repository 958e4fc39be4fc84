// SPDX-License-Identifier: Apache-2.0
#include "timeline.h"

#include <algorithm>

namespace kova_tool {

void Timeline::place(int64_t time_ms, uint32_t action, const int16_t* data, size_t samples) {
    if (!started_) {
        // The output begins with the gesture's first event.
        started_ = true;
        t0_ = time_ms;
    }
    if (samples == 0) return;
    const auto due = static_cast<size_t>((time_ms - t0_) * static_cast<int64_t>(rate_) / 1000);
    const auto tolerance = static_cast<size_t>(kGapToleranceMs * rate_ / 1000);
    size_t first = cursor_;
    if (due > cursor_ + tolerance) first = due;
    const size_t frames = (samples + channels_ - 1) / channels_;
    pcm_.resize(std::max(pcm_.size(), (first + frames) * channels_), 0);
    std::copy(data, data + samples, pcm_.begin() + static_cast<std::ptrdiff_t>(first * channels_));
    segments_.push_back({first, frames, action});
    cursor_ = first + frames;
}

}  // namespace kova_tool
