// SPDX-License-Identifier: Apache-2.0
/* Where rendered blocks land in the output, the way the live stream plays them: blocks queue one
 * after another like in the stream's ring buffer, and where the queue runs dry (a pause between
 * strokes) the output is silent until the next event's own time. */
#ifndef KOVA_TOOL_TIMELINE_H
#define KOVA_TOOL_TIMELINE_H

#include <cstddef>
#include <cstdint>
#include <vector>

namespace kova_tool {

/* One placed block: its first frame, its length in frames and the action that made it. */
struct Segment {
    size_t first = 0;
    size_t frames = 0;
    uint32_t action = 0;
};

class Timeline {
   public:
    /* A gap shorter than this is the rounding of block lengths (a block holds whole frames of a
     * whole-millisecond step), not a pause: the next block follows without silence. */
    static constexpr int64_t kGapToleranceMs = 10;

    Timeline(uint32_t rate, uint32_t channels) : rate_(rate), channels_(channels) {}

    /* Places `samples` interleaved samples made for an event at `time_ms`. A block that ends in
     * part of a frame is completed with zero samples, so channels stay in step. */
    void place(int64_t time_ms, uint32_t action, const int16_t* data, size_t samples);

    const std::vector<int16_t>& pcm() const { return pcm_; }
    const std::vector<Segment>& segments() const { return segments_; }
    size_t frames() const { return pcm_.size() / channels_; }

   private:
    uint32_t rate_;
    uint32_t channels_;
    bool started_ = false;
    int64_t t0_ = 0;
    size_t cursor_ = 0; /* frame where the queue ends */
    std::vector<int16_t> pcm_;
    std::vector<Segment> segments_;
};

}  // namespace kova_tool

#endif
