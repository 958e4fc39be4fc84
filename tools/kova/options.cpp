#include "options.h"

#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <set>
#include <tuple>

namespace kova_tool {
namespace {

constexpr uint32_t kMinRate = 8000;
constexpr uint32_t kMaxRate = 48000;
constexpr uint32_t kMaxScreen = 100000;
/* The engine accepts 3..199 ms between moves, so touch rates outside 10..300 Hz play nothing. */
constexpr uint32_t kMinTouchRate = 10;
constexpr uint32_t kMaxTouchRate = 300;

std::string range_text(double lo, double hi, std::string_view unit) {
    std::string r = num(lo) + ".." + num(hi);
    if (!unit.empty()) r += " " + std::string(unit);
    return r;
}

void set_tune(std::optional<double>& field, std::string_view name, Args& args) {
    field = parse_double(name, args.value(name), 0.0, 1.0);
}

int parse_slot(std::string_view option, const std::string& text) {
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
        if (text == slot_name(s)) return s;
    }
    usage_error(std::string(option) + " slot " + quoted(text) +
                " is unknown (accepted: start, loop, end)");
}

/* --repeat SLOT=START:END; either number may be left out to keep the stored value. */
RepeatArg parse_repeat(std::string_view option, const std::string& text) {
    RepeatArg r;
    r.text = text;
    const size_t eq = text.find('=');
    const size_t colon = text.find(':', eq == std::string::npos ? 0 : eq);
    if (eq == std::string::npos || colon == std::string::npos) {
        usage_error(std::string(option) + " " + quoted(text) +
                    " is not SLOT=START_MS:END_MS (for example loop=0:500)");
    }
    r.slot = parse_slot(option, text.substr(0, eq));
    const std::string start = text.substr(eq + 1, colon - eq - 1);
    const std::string end = text.substr(colon + 1);
    const std::string what = std::string(option) + " " + text.substr(0, eq);
    if (!start.empty())
        r.start_ms = static_cast<int32_t>(parse_int(what + " start", start, 0, 3600000, "ms"));
    if (!end.empty())
        r.end_ms = static_cast<int32_t>(parse_int(what + " end", end, 0, 3600000, "ms"));
    return r;
}

bool parse_filter_type(const std::string& text, uint32_t& type) {
    static const std::pair<const char*, uint32_t> names[] = {
        {"lowpass", KOVA_FLT_LOWPASS},       {"lp", KOVA_FLT_LOWPASS},
        {"highpass", KOVA_FLT_HIGHPASS},     {"hp", KOVA_FLT_HIGHPASS},
        {"bandpass", KOVA_FLT_BANDPASS},     {"bp", KOVA_FLT_BANDPASS},
        {"bandreject", KOVA_FLT_BANDREJECT}, {"br", KOVA_FLT_BANDREJECT},
        {"notch", KOVA_FLT_BANDREJECT}};
    for (const auto& [name, code] : names) {
        if (text == name) {
            type = code;
            return true;
        }
    }
    return false;
}

/* Completes one --filter once the rate is known: frequencies must lie below the Nyquist rate. */
void finish_filter(FilterArg& f, const FormatOptions& fmt) {
    std::vector<std::string> parts;
    size_t from = 0;
    for (;;) {
        const size_t colon = f.text.find(':', from);
        parts.push_back(f.text.substr(from, colon - from));
        if (colon == std::string::npos) break;
        from = colon + 1;
    }
    if (parts.size() < 2 || parts.size() > 3) {
        usage_error("--filter " + quoted(f.text) +
                    " is not TYPE:FREQ[:BANDWIDTH] (for example bandpass:2500:3000)");
    }
    uint32_t type = 0;
    if (!parse_filter_type(parts[0], type)) {
        usage_error("--filter type " + quoted(parts[0]) +
                    " is unknown (accepted: lowpass, highpass, bandpass, bandreject)");
    }
    const double nyquist = fmt.rate / 2.0;
    f.dsc = KOVA_FLT_DSC{};
    f.dsc.type = type;
    f.dsc.freq = parse_double("--filter frequency", parts[1], 1.0, nyquist - 1.0, "Hz");
    const bool band = type == KOVA_FLT_BANDPASS || type == KOVA_FLT_BANDREJECT;
    if (parts.size() == 3) {
        f.dsc.bandwidth = parse_double("--filter bandwidth", parts[2], 1.0, nyquist, "Hz");
    } else if (band) {
        usage_error("--filter " + quoted(f.text) + " needs a bandwidth: " +
                    std::string(filter_type_name(type)) + ":FREQ:BANDWIDTH");
    }
    f.dsc.enable = 1;
    f.dsc.samplerate = static_cast<int32_t>(fmt.rate);
    f.dsc.channels = static_cast<int32_t>(fmt.channels);
}

}  // namespace

KOVA_FORMAT FormatOptions::format() const {
    KOVA_FORMAT f{};
    f.sample_rate = rate;
    f.channels = channels;
    f.p = panning.value_or(channels == 2) ? 1u : 0u;
    f.w = width;
    f.h = height;
    return f;
}

double parse_double(std::string_view option, const std::string& text, double lo, double hi,
                    std::string_view unit) {
    errno = 0;
    char* end = nullptr;
    const double v = std::strtod(text.c_str(), &end);
    if (text.empty() || end != text.c_str() + text.size() || errno == ERANGE || std::isnan(v)) {
        usage_error(std::string(option) + " " + quoted(text) +
                    " is not a number (accepted: " + range_text(lo, hi, unit) + ")");
    }
    if (!(v >= lo && v <= hi)) {
        usage_error(std::string(option) + " " + text +
                    " is out of range (accepted: " + range_text(lo, hi, unit) + ")");
    }
    return v;
}

int64_t parse_int(std::string_view option, const std::string& text, int64_t lo, int64_t hi,
                  std::string_view unit) {
    errno = 0;
    char* end = nullptr;
    const long long v = std::strtoll(text.c_str(), &end, 10);
    if (text.empty() || end != text.c_str() + text.size() || errno == ERANGE) {
        usage_error(std::string(option) + " " + quoted(text) +
                    " is not a whole number (accepted: " +
                    range_text(static_cast<double>(lo), static_cast<double>(hi), unit) + ")");
    }
    if (v < lo || v > hi) {
        usage_error(std::string(option) + " " + text + " is out of range (accepted: " +
                    range_text(static_cast<double>(lo), static_cast<double>(hi), unit) + ")");
    }
    return v;
}

bool parse_on_off(std::string_view option, const std::string& text) {
    if (text == "on" || text == "1" || text == "yes") return true;
    if (text == "off" || text == "0" || text == "no") return false;
    usage_error(std::string(option) + " " + quoted(text) + " is not on or off");
}

std::pair<uint32_t, uint32_t> parse_size(std::string_view option, const std::string& text,
                                         uint32_t w_lo, uint32_t w_hi, uint32_t h_lo,
                                         uint32_t h_hi) {
    const size_t x = text.find('x');
    if (x == std::string::npos) {
        usage_error(std::string(option) + " " + quoted(text) +
                    " is not WIDTHxHEIGHT (for example 1080x2280)");
    }
    const std::string o(option);
    const auto w =
        static_cast<uint32_t>(parse_int(o + " width", text.substr(0, x), w_lo, w_hi, "px"));
    const auto h =
        static_cast<uint32_t>(parse_int(o + " height", text.substr(x + 1), h_lo, h_hi, "px"));
    return {w, h};
}

bool parse_setup_option(std::string_view name, Args& args, SetupOptions& s) {
    FormatOptions& f = s.format;
    TuneOptions& t = s.tune;
    if (name == "--rate") {
        f.rate = static_cast<uint32_t>(parse_int(name, args.value(name), kMinRate, kMaxRate, "Hz"));
    } else if (name == "--channels") {
        f.channels = static_cast<uint32_t>(parse_int(name, args.value(name), 1, 2));
    } else if (name == "--panning") {
        f.panning = parse_on_off(name, args.value(name));
    } else if (name == "--screen") {
        std::tie(f.width, f.height) =
            parse_size(name, args.value(name), 1, kMaxScreen, 1, kMaxScreen);
    } else if (name == "--set") {
        s.source.set_path = args.value(name);
    } else if (name == "--start" || name == "--loop" || name == "--end") {
        const int slot = name == "--start"  ? KOVA_SLOT_START
                         : name == "--loop" ? KOVA_SLOT_LOOP
                                            : KOVA_SLOT_END;
        s.source.slot[slot] = args.value(name);
        if (s.source.slot[slot].empty()) usage_error(std::string(name) + " needs a file name");
    } else if (name == "--filter") {
        s.source.filters.push_back(FilterArg{args.value(name), {}});
    } else if (name == "--repeat") {
        s.source.repeats.push_back(parse_repeat(name, args.value(name)));
    } else if (name == "--gain") {
        set_tune(t.gain, name, args);
    } else if (name == "--pan") {
        set_tune(t.pan, name, args);
    } else if (name == "--osc") {
        t.osc = parse_on_off(name, args.value(name));
    } else if (name == "--osc-depth") {
        set_tune(t.osc_depth, name, args);
    } else if (name == "--sharp") {
        t.sharp = parse_on_off(name, args.value(name));
    } else if (name == "--sharpness") {
        set_tune(t.sharpness, name, args);
    } else if (name == "--wn-gain") {
        set_tune(t.wn_gain, name, args);
    } else if (name == "--file-gain") {
        set_tune(t.file_gain, name, args);
    } else if (name == "--start-gain") {
        set_tune(t.start_gain, name, args);
    } else if (name == "--loop-gain") {
        set_tune(t.loop_gain, name, args);
    } else if (name == "--end-gain") {
        set_tune(t.end_gain, name, args);
    } else if (name == "--thickness") {
        s.level.thickness = parse_double(name, args.value(name), 0.0, 1.0);
    } else if (name == "--volume") {
        s.level.volume = parse_double(name, args.value(name), 0.0, 1.0);
    } else if (name == "--verbose" || name == "-v") {
        s.verbose = true;
    } else {
        return false;
    }
    return true;
}

bool parse_gesture_option(std::string_view name, Args& args, GestureOptions& g) {
    if (name == "--gesture") {
        g.gesture = args.value(name);
    } else if (name == "--touch-rate") {
        g.touch_rate = static_cast<uint32_t>(
            parse_int(name, args.value(name), kMinTouchRate, kMaxTouchRate, "Hz"));
    } else {
        return false;
    }
    return true;
}

bool read_gesture_command(Args& args, const char* command, const char* help, SetupOptions& setup,
                          GestureOptions& gesture,
                          const std::function<bool(const std::string&)>& own) {
    while (!args.done()) {
        const std::string name(args.next());
        if (name == "--help" || name == "-h") {
            std::fprintf(out(), "%s\n%s\n%s", help, kGestureHelp, kSetupHelp);
            return false;
        }
        if (!parse_setup_option(name, args, setup) && !parse_gesture_option(name, args, gesture) &&
            !own(name)) {
            usage_error("unknown option " + quoted(name) + " (see kova " + command + " --help)");
        }
    }
    finish_setup(setup);
    set_library_chatter(setup.verbose);
    return true;
}

void finish_setup(SetupOptions& s) {
    FormatOptions& f = s.format;
    if (f.panning.value_or(false) && f.channels != 2) {
        usage_error("--panning on needs --channels 2 (got --channels " +
                    std::to_string(f.channels) + ")");
    }
    SourceOptions& src = s.source;
    if (src.slot[KOVA_SLOT_LOOP] == kBuiltinSound) {
        usage_error(
            "--loop " + quoted(kBuiltinSound) +
            " is not available: the loop is a PCM file, a saved set or filtered noise (--filter)");
    }
    const bool has_loop =
        !src.set_path.empty() || !src.slot[KOVA_SLOT_LOOP].empty() || !src.filters.empty();
    if (!has_loop && (!src.slot[KOVA_SLOT_START].empty() || !src.slot[KOVA_SLOT_END].empty())) {
        usage_error(
            "--start and --end need a loop: give --loop FILE, --filter TYPE:FREQ[:BANDWIDTH] or "
            "--set FILE");
    }
    std::set<uint32_t> types;
    for (FilterArg& given : src.filters) {
        finish_filter(given, f);
        if (!types.insert(given.dsc.type).second) {
            usage_error("--filter " + quoted(given.text) + ": a set holds one filter per type (" +
                        filter_type_name(given.dsc.type) + " given twice)");
        }
    }
    if (s.tune.osc == false && s.tune.osc_depth) {
        usage_error("--osc-depth " + num(*s.tune.osc_depth) +
                    " needs the oscillator on (drop --osc off)");
    }
    if (s.tune.sharp == false && s.tune.sharpness) {
        usage_error("--sharpness " + num(*s.tune.sharpness) +
                    " needs resampling on (drop --sharp off)");
    }
}

const char* filter_type_name(uint32_t type) {
    switch (type) {
        case KOVA_FLT_LOWPASS:
            return "lowpass";
        case KOVA_FLT_HIGHPASS:
            return "highpass";
        case KOVA_FLT_BANDPASS:
            return "bandpass";
        case KOVA_FLT_BANDREJECT:
            return "bandreject";
        default:
            return "unknown";
    }
}

const char* slot_name(int slot) {
    switch (slot) {
        case KOVA_SLOT_START:
            return "start";
        case KOVA_SLOT_LOOP:
            return "loop";
        case KOVA_SLOT_END:
            return "end";
        default:
            return "?";
    }
}

const char* const kSetupHelp =
    "Format:\n"
    "  --rate HZ            sample rate, 8000..48000 (default 48000)\n"
    "  --channels N         1 or 2 (default 2)\n"
    "  --panning on|off     left/right follows the touch position (default: on in stereo)\n"
    "  --screen WxH         screen size in pixels (default 1080x2280)\n"
    "Source set (default: the built-in set = --filter bandpass:2500:3000 --start builtin\n"
    "            --end builtin):\n"
    "  --set FILE           a saved source-set file\n"
    "  --loop FILE          raw PCM loop sound (16-bit, the rate and channels above)\n"
    "  --start FILE|builtin raw PCM start sound, or the tool's own tick\n"
    "  --end FILE|builtin   raw PCM end sound, or the tool's own lift-off sound\n"
    "  --filter TYPE:FREQ[:BANDWIDTH]  lowpass, highpass, bandpass or bandreject (Hz);\n"
    "                       without --loop/--set the loop is white noise through the filters;\n"
    "                       otherwise the filters are attached to the set; repeatable\n"
    "  --repeat SLOT=START:END  repeat points in ms of slot start, loop or end\n"
    "Tune set (each 0..1; unset values keep the set's own):\n"
    "  --gain X  --pan X  --wn-gain X  --file-gain X  --start-gain X  --loop-gain X\n"
    "  --end-gain X  --osc on|off  --osc-depth X (turns the oscillator on)\n"
    "  --sharp on|off  --sharpness X (turns pitch raising on)\n";

const char* const kGestureHelp =
    "Gesture:\n"
    "  --gesture FILE|NAME  a CSV file (time_ms,action,x,y[,aux]) or a built-in gesture:\n"
    "                       slow, fast or strokes (default strokes)\n"
    "  --touch-rate HZ      event rate of the built-in gestures, 10..300 (default 120)\n";

}  // namespace kova_tool
