/* The tool's built-in source set: white noise through a band-pass from about 1 to 4 kHz as the
 * loop (the scratch of a pen on paper), the tool's own start and end sounds, and levels chosen so
 * a default render peaks a few dB below full scale. Depends only on the library's C API and the
 * C++ standard library, so the browser studio builds the very same set. */
#ifndef KOVA_TOOL_BUILTIN_SET_H
#define KOVA_TOOL_BUILTIN_SET_H

#include <kova/kova_types.h>

#include <cstdint>

namespace kova_tool {

/* The built-in loop's filter for `format` (the band is narrowed at rates below 10 kHz). */
KOVA_FLT_DSC builtin_filter(const KOVA_FORMAT& format);

/* Sets the built-in set's levels in `tune` (gain, pan, wn_gain, file_gain, start_gain, loop_gain,
 * end_gain); other fields are left as they are. */
void builtin_levels(KOVA_TUNE_SET& tune);

/* Registers the built-in set in `ctx`, created with `format`: the noise loop by filter, the start
 * and end sounds from a private temporary folder (removed before returning), the built-in levels.
 * Makes the set active and returns its id; 0 on failure with the library's code in `err`
 * (KOVA_ERR_SOURCE when the temporary folder cannot be written). */
int32_t register_builtin_set(KOVA_CTX* ctx, const KOVA_FORMAT& format, int32_t* err);

}  // namespace kova_tool

#endif
