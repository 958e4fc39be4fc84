/* Command-line options shared by render, play and save (CLI11), and their cross-checks. Every
 * check names the bad value and the accepted range. */
#ifndef KOVA_TOOL_OPTIONS_H
#define KOVA_TOOL_OPTIONS_H

#include <kova/kova_types.h>

#include <CLI/CLI.hpp>
#include <array>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "cli.h"

namespace kova_tool {

/* The format block handed to the engine. Panning defaults to on in stereo, off in mono. */
struct FormatOptions {
    uint32_t rate = 48000;
    uint32_t channels = 2;
    std::optional<bool> panning;
    uint32_t width = 1080;
    uint32_t height = 2280;

    KOVA_FORMAT format() const;
};

/* One --filter TYPE:FREQ[:BANDWIDTH]; the descriptor is completed once the format is known. */
struct FilterArg {
    std::string text;
    KOVA_FLT_DSC dsc{};
};

/* One --repeat SLOT=START:END in milliseconds; -1 keeps the stored value. */
struct RepeatArg {
    int slot = KOVA_SLOT_LOOP;
    int32_t start_ms = -1;
    int32_t end_ms = -1;
};

/* The keyword that selects the tool's own start or end sound instead of a file. */
inline constexpr std::string_view kBuiltinSound = "builtin";

/* Where the source set comes from. With none of set/loop/filters given, the built-in set is used
 * (builtin_set.h). */
struct SourceOptions {
    std::string set_path;                            /* --set: a saved source-set file */
    std::array<std::string, KOVA_SLOT_COUNT> slot{}; /* --start/--loop/--end: a file or builtin */
    bool raw = false;                                /* --raw: every sound file is raw PCM */
    std::vector<std::string> filter_texts, repeat_texts; /* as given; parsed by finish_setup */
    std::vector<FilterArg> filters;
    std::vector<RepeatArg> repeats;

    bool builtin() const {
        return set_path.empty() && slot[KOVA_SLOT_LOOP].empty() && filter_texts.empty();
    }
};

/* Tune-set values given on the command line; unset ones keep the set's values. */
struct TuneOptions {
    std::optional<double> gain, pan, osc_depth, sharpness, wn_gain, file_gain, start_gain,
        loop_gain, end_gain;
    std::optional<bool> osc, sharp;
};

/* Everything that builds and tunes an engine's source set. */
struct SetupOptions {
    FormatOptions format;
    SourceOptions source;
    TuneOptions tune;
    std::optional<double> thickness, volume; /* render and play only */
};

/* Gesture selection: a CSV file or the name of a built-in gesture. */
struct GestureOptions {
    std::string gesture = "strokes";
    uint32_t touch_rate = 120;
};

/* A check for a number in lo..hi ("1.5 is out of range (accepted: 0..1)"); `whole` refuses
 * fractions. */
CLI::Validator in_range(double lo, double hi, std::string unit = "", bool whole = false);
/* Adds "--NAME on|off" storing into `field`. */
CLI::Option* add_on_off(CLI::App& app, const std::string& name, std::optional<bool>& field,
                        const std::string& help);
/* Adds "--NAME WxH" with each side in its range. */
CLI::Option* add_size(CLI::App& app, const std::string& name, uint32_t& w, uint32_t& h,
                      uint32_t w_lo, uint32_t w_hi, uint32_t h_lo, uint32_t h_hi,
                      const std::string& help);

/* The shared options of render and play (`player`: with --thickness and --volume) and save. */
void add_setup_options(CLI::App& app, SetupOptions& setup, bool player);
void add_gesture_options(CLI::App& app, GestureOptions& gesture);

/* Cross-checks once every option is read (panning needs stereo, filters need the rate, ...). */
void finish_setup(SetupOptions& setup);

const char* filter_type_name(uint32_t type);
const char* slot_name(int slot);

}  // namespace kova_tool

#endif
