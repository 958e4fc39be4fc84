// SPDX-License-Identifier: Apache-2.0
/* A plausibility check of a source-set file before the library reads it. The file has no magic
 * number, so any file would be read as one; this catches the files whose counts and sizes cannot
 * come from a saved set, which would otherwise make the reader loop or allocate without bound. */
#ifndef KOVA_TOOL_SAVEFILE_CHECK_H
#define KOVA_TOOL_SAVEFILE_CHECK_H

#include <cstdint>
#include <string>

namespace kova_tool {

struct SavedFormat {
    int32_t rate;
    int32_t channels;
};

/* Fails (exit 1) with "cannot read ..." or "... is not a source-set file (reason)"; with
 * `need_loop`, also when the file holds no loop sound (such a set cannot play a stroke). Returns
 * the rate and channel count the set was saved for. */
SavedFormat check_source_set_file(const std::string& path, bool need_loop);

}  // namespace kova_tool

#endif
