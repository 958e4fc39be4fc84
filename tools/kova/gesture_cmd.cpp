#include "commands.h"
#include "gesture.h"
#include "output_file.h"

#include <unistd.h>

#include <memory>

namespace kova_tool {
namespace {

struct GestureCommand {
    GestureOptions gesture;
    FormatOptions format;
    std::string output;
};

int run_gesture(const GestureCommand& o) {
    const auto events =
        builtin_gesture(o.gesture.gesture, o.gesture.touch_rate, o.format.width, o.format.height);
    if (o.output.empty()) {
        write_gesture_csv(out(), events);
        return kExitOk;
    }
    OutputFile file(o.output);
    std::FILE* f = fdopen(dup(file.fd()), "w");
    if (!f) failure("cannot write " + in_quotes(o.output));
    write_gesture_csv(f, events);
    if (std::fclose(f) != 0) failure("cannot write " + in_quotes(o.output));
    file.commit();
    return kExitOk;
}

}  // namespace

Run add_gesture(CLI::App& app) {
    auto o = std::make_shared<GestureCommand>();
    CLI::App* sub = app.add_subcommand(
        "gesture", "print a built-in gesture as CSV, a start for gestures of your own");
    sub->add_option("name", o->gesture.gesture, "slow, fast or strokes (default strokes)")
        ->check(CLI::IsMember({"slow", "fast", "strokes"}))
        ->type_name("NAME");
    sub->add_option("--touch-rate", o->gesture.touch_rate, "event rate, 10..300 Hz (default 120)")
        ->check(in_range(10, 300, "Hz", true))
        ->type_name("HZ");
    add_size(*sub, "--screen", o->format.width, o->format.height, 1, 100000, 1, 100000,
             "screen size in pixels (default 1080x2280)");
    sub->add_option("-o,--output", o->output, "write to FILE instead of standard output")
        ->type_name("FILE");
    return [o] { return run_gesture(*o); };
}

}  // namespace kova_tool
