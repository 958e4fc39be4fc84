// SPDX-License-Identifier: Apache-2.0
#include "options.h"

#include <kova/kova_engine.h>

#include <cmath>
#include <set>

#include "builtin_set.h"

namespace kova_tool {
namespace {

constexpr uint32_t kMaxScreen = 100000;
constexpr int32_t kMaxRepeatMs = 3600000;

std::string range_text(double lo, double hi, const std::string& unit) {
    return num(lo) + ".." + num(hi) + (unit.empty() ? "" : " " + unit);
}

/* Parses a number of `what` in lo..hi or throws the validator's message. */
double number_in(const std::string& what, const std::string& text, double lo, double hi,
                 const std::string& unit = "", bool whole = false) {
    const std::string msg = CLI::Validator(in_range(lo, hi, unit, whole))(text);
    if (!msg.empty()) throw CLI::ValidationError(what, msg);
    return std::stod(text);
}

int parse_slot(const std::string& text) {
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
        if (text == slot_name(s)) return s;
    }
    throw CLI::ValidationError(
        "--repeat", "slot " + in_quotes(text) + " is unknown (accepted: start, loop, end)");
}

/* --repeat SLOT=START:END; either number may be left out to keep the stored value. */
RepeatArg parse_repeat(const std::string& text) {
    const size_t eq = text.find('=');
    const size_t colon = text.find(':', eq == std::string::npos ? 0 : eq);
    if (eq == std::string::npos || colon == std::string::npos) {
        throw CLI::ValidationError("--repeat", in_quotes(text) +
                                                   " is not SLOT=START_MS:END_MS (for example "
                                                   "loop=0:500)");
    }
    RepeatArg r;
    r.slot = parse_slot(text.substr(0, eq));
    const std::string what = "--repeat " + text.substr(0, eq);
    const std::string start = text.substr(eq + 1, colon - eq - 1), end = text.substr(colon + 1);
    if (!start.empty())
        r.start_ms =
            static_cast<int32_t>(number_in(what + " start", start, 0, kMaxRepeatMs, "ms", true));
    if (!end.empty())
        r.end_ms = static_cast<int32_t>(number_in(what + " end", end, 0, kMaxRepeatMs, "ms", true));
    if (r.start_ms >= 0 && r.end_ms >= 0 && r.start_ms > r.end_ms) {
        throw CLI::ValidationError(
            what, "start " + start + " is after end " + end + " (START_MS must not exceed END_MS)");
    }
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
        if (text == name) return type = code, true;
    }
    return false;
}

/* Completes one --filter once the rate is known: frequencies must lie below the Nyquist rate.
 * These ranges only name the bad field in a usage message; whether a descriptor is usable is the
 * library's decision (it refuses the registration otherwise). */
void finish_filter(FilterArg& f, const FormatOptions& fmt) {
    const std::vector<std::string> parts = CLI::detail::split(f.text, ':');
    if (parts.size() < 2 || parts.size() > 3) {
        usage_error("--filter " + in_quotes(f.text) +
                    " is not TYPE:FREQ[:BANDWIDTH] (for example bandpass:2500:3000)");
    }
    uint32_t type = 0;
    if (!parse_filter_type(parts[0], type)) {
        usage_error("--filter type " + in_quotes(parts[0]) +
                    " is unknown (accepted: lowpass, highpass, bandpass, bandreject)");
    }
    const double nyquist = fmt.rate / 2.0;
    f.dsc = KOVA_FLT_DSC{};
    f.dsc.type = type;
    f.dsc.freq = number_in("--filter frequency", parts[1], 1.0, nyquist - 1.0, "Hz");
    if (parts.size() == 3)
        f.dsc.bandwidth = number_in("--filter bandwidth", parts[2], 1.0, nyquist, "Hz");
    if (parts.size() == 2 && (type == KOVA_FLT_BANDPASS || type == KOVA_FLT_BANDREJECT)) {
        usage_error("--filter " + in_quotes(f.text) + " needs a bandwidth: " +
                    std::string(filter_type_name(type)) + ":FREQ:BANDWIDTH");
    }
    f.dsc.enable = 1;
    f.dsc.samplerate = static_cast<int32_t>(fmt.rate);
    f.dsc.channels = static_cast<int32_t>(fmt.channels);
}

/* Sets the value's placeholder in the help and the help section. */
CLI::Option* shown(CLI::Option* option, const std::string& type, const std::string& group) {
    return option->type_name(type)->group(group);
}

constexpr const char* kTuneGroup = "Tune set (each 0..1; unset values keep the set's own)";

CLI::Option* add_level(CLI::App& app, const std::string& name, std::optional<double>& field,
                       const std::string& help, const std::string& group) {
    auto set = [&field](const double& v) { field = v; };
    return shown(app.add_option_function<double>(name, set, help), "X", group)
        ->check(in_range(0, 1));
}

/* The tune values each kind of set starts with, from the library's defaults and the built-in
 * set's levels: printed under the options so nobody has to guess "the set's". */
std::string tune_defaults() {
    KOVA_TUNE_SET lib{};
    _cfg_tune_default(&lib);
    KOVA_TUNE_SET files = lib, filter = lib, builtin = lib;
    files.wn_gain = 0.0;     // a loop from a file plays at file_gain
    filter.file_gain = 0.0;  // a noise loop plays at wn_gain
    builtin_levels(builtin);
    auto row = [](const char* name, const KOVA_TUNE_SET& t) {
        char buf[200];
        std::snprintf(buf, sizeof buf, "  %-10s %-5s %-5s %-9s %-9s %-7s %-9s %-10s %-9s %s\n",
                      name, num(t.gain).c_str(), num(t.pan).c_str(), num(t.osc_depth).c_str(),
                      num(t.sharpness).c_str(), num(t.wn_gain).c_str(), num(t.file_gain).c_str(),
                      num(t.start_gain).c_str(), num(t.loop_gain).c_str(), num(t.end_gain).c_str());
        return std::string(buf);
    };
    return "Tune-set values a new set starts with (--osc and --sharp off; a saved set keeps its "
           "own):\n"
           "  set        gain  pan   osc-depth sharpness wn-gain file-gain start-gain loop-gain "
           "end-gain\n" +
           row("built-in", builtin) + row("--loop", files) + row("--filter", filter);
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

CLI::Validator in_range(double lo, double hi, std::string unit, bool whole) {
    return CLI::Validator(
        [=](std::string& text) -> std::string {
            const std::string accepted = " (accepted: " + range_text(lo, hi, unit) + ")";
            double v = 0;
            if (!CLI::detail::lexical_cast(text, v) || std::isnan(v) ||
                (whole && v != std::floor(v))) {
                return in_quotes(text) + (whole ? " is not a whole number" : " is not a number") +
                       accepted;
            }
            return v >= lo && v <= hi ? "" : text + " is out of range" + accepted;
        },
        "");
}

CLI::Option* add_on_off(CLI::App& app, const std::string& name, std::optional<bool>& field,
                        const std::string& help) {
    return app
        .add_option_function<std::string>(
            name, [&field](const std::string& v) { field = v == "on"; }, help)
        ->check(CLI::Validator(
            [](std::string& v) -> std::string {
                return v == "on" || v == "off" ? "" : in_quotes(v) + " is not on or off";
            },
            ""))
        ->type_name("on|off");
}

CLI::Option* add_size(CLI::App& app, const std::string& name, uint32_t& w, uint32_t& h,
                      uint32_t w_lo, uint32_t w_hi, uint32_t h_lo, uint32_t h_hi,
                      const std::string& help) {
    return app
        .add_option_function<std::string>(
            name,
            [=, &w, &h](const std::string& text) {
                const size_t x = text.find('x');
                if (x == std::string::npos) {
                    throw CLI::ValidationError(name, in_quotes(text) +
                                                         " is not WIDTHxHEIGHT (for example "
                                                         "1080x2280)");
                }
                w = static_cast<uint32_t>(
                    number_in(name + " width", text.substr(0, x), w_lo, w_hi, "px", true));
                h = static_cast<uint32_t>(
                    number_in(name + " height", text.substr(x + 1), h_lo, h_hi, "px", true));
            },
            help)
        ->type_name("WxH");
}

void add_setup_options(CLI::App& app, SetupOptions& s, bool player) {
    FormatOptions& f = s.format;
    const std::string format = "Format", tune = kTuneGroup;
    shown(app.add_option("--rate", f.rate, "sample rate, 8000..48000 Hz (default 48000)"), "HZ",
          format)
        ->check(in_range(8000, 48000, "Hz", true));
    shown(app.add_option("--channels", f.channels, "1 or 2 (default 2)"), "N", format)
        ->check(in_range(1, 2, "", true));
    add_on_off(app, "--panning", f.panning,
               "left/right follows the touch position (default: on in stereo)")
        ->group(format);
    add_size(app, "--screen", f.width, f.height, 1, kMaxScreen, 1, kMaxScreen,
             "screen size in pixels, 1..100000 each (default 1080x2280)")
        ->group(format);

    SourceOptions& src = s.source;
    const std::string source =
        "Source set (default: the built-in set, a band-pass noise loop with the tool's own start "
        "and end sounds)";
    shown(app.add_option("--set", src.set_path, "a saved source-set file"), "FILE", source);
    const char* slot_help[KOVA_SLOT_COUNT] = {
        "start sound: a sound file, or builtin for the tool's own tick",
        "loop sound: a sound file (WAV, FLAC, Ogg, ... or raw PCM)",
        "end sound: a sound file, or builtin for the tool's own lift-off sound"};
    for (size_t slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        shown(app.add_option("--" + std::string(slot_name(static_cast<int>(slot))), src.slot[slot],
                             slot_help[slot]),
              slot == KOVA_SLOT_LOOP ? "FILE" : "FILE|builtin", source)
            ->check(
                CLI::Validator([](std::string& v) { return v.empty() ? "needs a file" : ""; }, ""));
    }
    app.add_flag("--raw", src.raw,
                 "read every sound file as raw 16-bit PCM at --rate/--channels (files named "
                 "*.raw or *.pcm always are)")
        ->group(source);
    shown(app.add_option("--filter", src.filter_texts,
                         "TYPE:FREQ[:BANDWIDTH], TYPE lowpass, highpass, bandpass or bandreject "
                         "(Hz); without --loop/--set the loop is white noise through the "
                         "filters, otherwise they are attached to the set; repeatable"),
          "TYPE:FREQ[:BW]", source)
        ->allow_extra_args(false);
    shown(app.add_option("--repeat", src.repeat_texts,
                         "repeat points in ms of slot start, loop or end; START <= END, a number "
                         "left out keeps its value"),
          "SLOT=START:END", source)
        ->allow_extra_args(false);
    TuneOptions& t = s.tune;
    add_level(app, "--gain", t.gain, "factor of every level", tune);
    add_level(app, "--pan", t.pan, "depth of position panning", tune);
    add_level(app, "--wn-gain", t.wn_gain, "level of a noise loop", tune);
    add_level(app, "--file-gain", t.file_gain, "level of a loop from a file or saved set", tune);
    add_level(app, "--start-gain", t.start_gain, "level of the start sound", tune);
    add_level(app, "--loop-gain", t.loop_gain, "level of the loop sound", tune);
    add_level(app, "--end-gain", t.end_gain, "level of the end sound", tune);
    add_on_off(app, "--osc", t.osc, "speed-following amplitude modulation")->group(tune);
    add_level(app, "--osc-depth", t.osc_depth, "oscillator depth; turns the oscillator on", tune);
    add_on_off(app, "--sharp", t.sharp, "pitch rises with speed")->group(tune);
    add_level(app, "--sharpness", t.sharpness, "pitch raising depth; turns it on", tune);
    if (player) {
        add_level(app, "--thickness", s.thickness, "equaliser thickness, 0..1 (default 0.6)",
                  "Player");
        add_level(app, "--volume", s.volume,
                  "output volume, 0..1 (default 1, the library's 0.8 of full scale)", "Player");
    }
    app.footer(tune_defaults());
}

void add_gesture_options(CLI::App& app, GestureOptions& g) {
    app.add_option("--gesture", g.gesture,
                   "a CSV file (time_ms,action,x,y[,aux]) or a built-in gesture: slow, fast or "
                   "strokes (default strokes)")
        ->type_name("FILE|NAME")
        ->group("Gesture");
    app.add_option("--touch-rate", g.touch_rate,
                   "event rate of the built-in gestures, 10..300 Hz (default 120)")
        ->check(in_range(10, 300, "Hz", true))
        ->type_name("HZ")
        ->group("Gesture");
}

void finish_setup(SetupOptions& s) {
    FormatOptions& f = s.format;
    if (f.panning.value_or(false) && f.channels != 2) {
        usage_error("--panning on needs --channels 2 (got --channels " +
                    std::to_string(f.channels) + ")");
    }
    SourceOptions& src = s.source;
    if (src.slot[KOVA_SLOT_LOOP] == kBuiltinSound) {
        usage_error("--loop " + in_quotes(kBuiltinSound) +
                    " is not available: the loop is a sound file, a saved set or filtered noise "
                    "(--filter)");
    }
    const bool has_loop =
        !src.set_path.empty() || !src.slot[KOVA_SLOT_LOOP].empty() || !src.filter_texts.empty();
    if (!has_loop && (!src.slot[KOVA_SLOT_START].empty() || !src.slot[KOVA_SLOT_END].empty())) {
        usage_error(
            "--start and --end need a loop: give --loop FILE, --filter TYPE:FREQ[:BANDWIDTH] or "
            "--set FILE");
    }
    for (const std::string& text : src.repeat_texts) src.repeats.push_back(parse_repeat(text));
    for (const std::string& text : src.filter_texts) src.filters.push_back(FilterArg{text, {}});
    std::set<uint32_t> types;
    for (FilterArg& given : src.filters) {
        finish_filter(given, f);
        if (!types.insert(given.dsc.type).second) {
            usage_error("--filter " + in_quotes(given.text) +
                        ": a set holds one filter per type (" + filter_type_name(given.dsc.type) +
                        " given twice)");
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
    static const char* const names[] = {"lowpass", "highpass", "bandpass", "bandreject"};
    return type < 4 ? names[type] : "unknown";
}

const char* slot_name(int slot) {
    static const char* const names[] = {"start", "loop", "end"};
    return slot >= 0 && slot < KOVA_SLOT_COUNT ? names[slot] : "?";
}

}  // namespace kova_tool
