/* The subcommands of the kova tool. Each reads its own options from `args` and returns the exit
 * code; failures are thrown as ToolError. */
#ifndef KOVA_TOOL_COMMANDS_H
#define KOVA_TOOL_COMMANDS_H

#include "cli.h"

namespace kova_tool {

int run_render(Args& args);
int run_play(Args& args);
int run_save(Args& args);
int run_inspect(Args& args);
int run_gesture(Args& args);

/* The engine's output buffer for one event, as large as the Java binding's PCM buffer. */
constexpr int32_t kBlockBytes = 960000;

}  // namespace kova_tool

#endif
