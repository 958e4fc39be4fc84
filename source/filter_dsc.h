// The one place that decides whether a filter descriptor can be used, for each use of it.
#ifndef KOVA_SOURCE_FILTER_DSC_H
#define KOVA_SOURCE_FILTER_DSC_H

#include "kova/kova_types.h"

namespace kova_source {

// Each use asks everything the one before it asks, and more.
enum class FilterUse {
    kType,    // a known type code (kova_is_valid_filter)
    kStored,  // read from a set file: also one or two channels, the only counts an engine runs
              // with (a filter keeps state per channel, so a hostile count would make it
              // allocate gigabytes); other fields are used as stored
    kDesign,  // given to an engine: also a design that stays finite and stable
};

bool filter_dsc_ok(const KOVA_FLT_DSC* dsc, FilterUse use);

}  // namespace kova_source

#endif
