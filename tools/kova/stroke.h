/* What render and play share: reading their command line and generating a gesture's blocks. */
#ifndef KOVA_TOOL_STROKE_H
#define KOVA_TOOL_STROKE_H

#include <kova/kova_types.h>

#include <functional>
#include <string>
#include <vector>

#include "commands.h"
#include "gesture.h"
#include "options.h"

namespace kova_tool {

/* A gesture command's settings once its command line is read. */
struct StrokeCommand {
    SetupOptions setup;
    GestureOptions gesture;
    KOVA_FORMAT format{};
    std::vector<TouchEvent> events;
};

/* Reads the command line of `command` ("render" or "play"): the setup and gesture options, and
 * any other option through `own`, which returns false for a name that is not its own. --help
 * prints `help` with the shared help and returns false. Otherwise the setup is cross-checked, the
 * library's chatter is set and the gesture is loaded. */
bool read_stroke_command(Args& args, const char* command, const char* help,
                         const std::function<bool(const std::string&)>& own, StrokeCommand& cmd);

/* The engine's output buffer, one event at a time. */
class EventBlock {
   public:
    /* Generates the block of `e`; returns the bytes produced (0 when nothing sounds). */
    int32_t generate(KOVA_CTX* ctx, const TouchEvent& e);
    int16_t* data() { return block_.data(); }

   private:
    std::vector<int16_t> block_ = std::vector<int16_t>(kBlockBytes / 2);
};

}  // namespace kova_tool

#endif
