// SPDX-License-Identifier: Apache-2.0
// The sound files every benchmark instance registers: start, loop and end PCM of the largest
// sizes a file may have (38400, 192000 and 38400 bytes of noise-like stereo 16-bit), written once
// into a temporary directory that is removed at exit.
#ifndef KOVA_BENCH_FILES_H
#define KOVA_BENCH_FILES_H

#include <string>

namespace kova_bench {

// Paths in slot order (start, loop, end), valid until exit.
const char* const* pcm_paths();
// A path in the same temporary directory for a file the caller creates.
std::string scratch_path(const char* name);

}  // namespace kova_bench

#endif
