// SPDX-License-Identifier: Apache-2.0
/* 16-bit PCM WAV output through libsndfile. */
#ifndef KOVA_TOOL_WAV_H
#define KOVA_TOOL_WAV_H

#include <cstdint>
#include <string>
#include <vector>

namespace kova_tool {

class OutputFile;

/* Writes interleaved samples as a WAV file into `file`; the caller commits it. */
void write_wav(OutputFile& file, const std::vector<int16_t>& pcm, uint32_t rate, uint32_t channels);

}  // namespace kova_tool

#endif
