#include "commands.h"
#include "gesture.h"
#include "output_file.h"

#include <unistd.h>

namespace kova_tool {
namespace {

const char* const kHelp =
    "Usage: kova gesture [NAME] [options]\n"
    "Prints a built-in gesture (slow, fast or strokes; default strokes) as CSV, the format that\n"
    "--gesture FILE reads: a starting point for gestures of your own.\n"
    "\n"
    "  --touch-rate HZ      event rate, 10..300 (default 120)\n"
    "  --screen WxH         screen size in pixels (default 1080x2280)\n"
    "  -o, --output FILE    write to FILE instead of standard output\n";

}  // namespace

int run_gesture(Args& args) {
    GestureOptions g;
    SetupOptions setup;
    std::string output;
    bool named = false;
    while (!args.done()) {
        const std::string name(args.next());
        if (name == "--help" || name == "-h") {
            std::fprintf(out(), "%s", kHelp);
            return kExitOk;
        }
        if (name == "--touch-rate") {
            parse_gesture_option(name, args, g);
        } else if (name == "--screen") {
            parse_setup_option(name, args, setup);
        } else if (name == "-o" || name == "--output") {
            output = args.value(name);
        } else if (!name.empty() && name[0] != '-' && !named) {
            g.gesture = name;
            named = true;
        } else {
            usage_error("unknown argument " + quoted(name) + " (see kova gesture --help)");
        }
    }
    const auto events =
        builtin_gesture(g.gesture, g.touch_rate, setup.format.width, setup.format.height);
    if (events.empty()) {
        usage_error("gesture " + quoted(g.gesture) +
                    " is unknown (accepted: " + kBuiltinGestureNames + ")");
    }
    if (output.empty()) {
        write_gesture_csv(out(), events);
        return kExitOk;
    }
    OutputFile file(output);
    std::FILE* f = fdopen(dup(file.fd()), "w");
    if (!f) failure("cannot write " + quoted(output));
    write_gesture_csv(f, events);
    if (std::fclose(f) != 0) failure("cannot write " + quoted(output));
    file.commit();
    return kExitOk;
}

}  // namespace kova_tool
