// SPDX-License-Identifier: Apache-2.0
// The one place that decides whether a filter descriptor can be used, for each use of it.
#ifndef KOVA_SOURCE_FILTER_DSC_H
#define KOVA_SOURCE_FILTER_DSC_H

#include "kova/kova_types.h"

namespace kova_source {

constexpr int32_t kMaxStoredChannels = 8;

// Each use asks everything the one before it asks, and more.
enum class FilterUse {
    kType,    // a known type code (kova_is_valid_filter)
    kStored,  // read from a set file: also at most kMaxStoredChannels channels (a filter keeps
              // state per channel, so a huge count would allocate without bound; counts up to
              // it, 0 and negative ones included, are safe: the filter processes 1 to 8 channels
              // and skips counts below 1); other fields are used as stored, the filter design
              // copes with degenerate frequencies
    kDesign,  // given to an engine: also one or two channels and a design that stays finite
              // and stable
};

bool filter_dsc_ok(const KOVA_FLT_DSC* dsc, FilterUse use);

}  // namespace kova_source

#endif
