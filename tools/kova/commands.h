/* The subcommands of the kova tool. Each adds itself to the command line and returns what runs
 * it with the parsed options; failures are thrown as ToolError. */
#ifndef KOVA_TOOL_COMMANDS_H
#define KOVA_TOOL_COMMANDS_H

#include <CLI/CLI.hpp>
#include <functional>

namespace kova_tool {

/* Returns the exit code. */
using Run = std::function<int()>;

Run add_render(CLI::App& app);
Run add_play(CLI::App& app);
Run add_save(CLI::App& app);
Run add_inspect(CLI::App& app);
Run add_gesture(CLI::App& app);

/* The engine's output buffer for one event, as large as the Java binding's PCM buffer. */
constexpr int32_t kBlockBytes = 960000;

}  // namespace kova_tool

#endif
