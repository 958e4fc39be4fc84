// SPDX-License-Identifier: Apache-2.0
/* A PNG picture of rendered sound: the waveform of each channel over a strip that marks where the
 * start, loop and end blocks lie, and a spectrogram below, on a shared time axis. */
#ifndef KOVA_TOOL_PICTURE_H
#define KOVA_TOOL_PICTURE_H

#include <cstdint>
#include <string>
#include <vector>

#include "timeline.h"

namespace kova_tool {

struct PictureOptions {
    uint32_t width = 1200;
    uint32_t height = 720;
    std::string title;
};

constexpr uint32_t kPictureMinWidth = 400;
constexpr uint32_t kPictureMaxWidth = 8000;
constexpr uint32_t kPictureMinHeight = 300;
constexpr uint32_t kPictureMaxHeight = 4000;

class OutputFile;

/* Draws the picture into `file` as PNG; the caller commits it. */
void write_picture(OutputFile& file, const std::vector<int16_t>& pcm, uint32_t rate,
                   uint32_t channels, const std::vector<Segment>& segments,
                   const PictureOptions& opts);

}  // namespace kova_tool

#endif
