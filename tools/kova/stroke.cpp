#include "stroke.h"

#include <kova/kova_engine.h>

namespace kova_tool {

bool read_stroke_command(Args& args, const char* command, const char* help,
                         const std::function<bool(const std::string&)>& own, StrokeCommand& cmd) {
    while (!args.done()) {
        const std::string name(args.next());
        if (name == "--help" || name == "-h") {
            std::fprintf(out(), "%s\n%s\n%s", help, kGestureHelp, kSetupHelp);
            return false;
        }
        if (parse_setup_option(name, args, cmd.setup) ||
            parse_gesture_option(name, args, cmd.gesture) || own(name))
            continue;
        usage_error("unknown option " + quoted(name) + " (see kova " + command + " --help)");
    }
    finish_setup(cmd.setup);
    set_library_chatter(cmd.setup.verbose);
    cmd.format = cmd.setup.format.format();
    cmd.events = load_gesture(cmd.gesture, cmd.format.w, cmd.format.h);
    return true;
}

int32_t EventBlock::generate(KOVA_CTX* ctx, const TouchEvent& e) {
    const KOVA_PARAM p{e.x, e.y, e.time_ms, e.aux, e.action};
    KOVA_PCMBUF buf{block_.data(), kBlockBytes};
    return kova_gen_sounds(ctx, &p, &buf);
}

}  // namespace kova_tool
