/* Command-line options shared by render, play and save, and their validation. Every check names
 * the bad value and the accepted range. */
#ifndef KOVA_TOOL_OPTIONS_H
#define KOVA_TOOL_OPTIONS_H

#include <kova/kova_types.h>

#include <array>
#include <cstdint>
#include <functional>
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
    std::string text;
    int slot = KOVA_SLOT_LOOP;
    int32_t start_ms = -1;
    int32_t end_ms = -1;
};

/* The keyword that selects the tool's own start or end sound instead of a file. */
inline constexpr std::string_view kBuiltinSound = "builtin";

/* Where the source set comes from. With none of set/loop/filters given, the built-in set is used:
 * the same as --filter bandpass:2500:3000 --start builtin --end builtin. */
struct SourceOptions {
    std::string set_path;                            /* --set: a saved source-set file */
    std::array<std::string, KOVA_SLOT_COUNT> slot{}; /* --start/--loop/--end: raw PCM or builtin */
    std::vector<FilterArg> filters;
    std::vector<RepeatArg> repeats;

    bool builtin() const {
        return set_path.empty() && slot[KOVA_SLOT_LOOP].empty() && filters.empty();
    }
};

/* Tune-set values given on the command line; unset ones keep the set's values. */
struct TuneOptions {
    std::optional<double> gain, pan, osc_depth, sharpness, wn_gain, file_gain, start_gain,
        loop_gain, end_gain;
    std::optional<bool> osc, sharp;
};

struct LevelOptions {
    std::optional<double> thickness;
    std::optional<double> volume;
};

/* Everything that builds and tunes an engine's source set. */
struct SetupOptions {
    FormatOptions format;
    SourceOptions source;
    TuneOptions tune;
    LevelOptions level;
    bool verbose = false;
};

/* Gesture selection: a CSV file or the name of a built-in gesture. */
struct GestureOptions {
    std::string gesture = "strokes";
    uint32_t touch_rate = 120;
};

/* Number parsing with range checks: "--gain 1.5 is out of range (accepted: 0..1)". */
double parse_double(std::string_view option, const std::string& text, double lo, double hi,
                    std::string_view unit = "");
int64_t parse_int(std::string_view option, const std::string& text, int64_t lo, int64_t hi,
                  std::string_view unit = "");
bool parse_on_off(std::string_view option, const std::string& text);
/* "WxH" with the width in w_lo..w_hi and the height in h_lo..h_hi. */
std::pair<uint32_t, uint32_t> parse_size(std::string_view option, const std::string& text,
                                         uint32_t w_lo, uint32_t w_hi, uint32_t h_lo,
                                         uint32_t h_hi);

/* Each takes the option just read from `args`; returns false when the name is not its own. */
bool parse_setup_option(std::string_view name, Args& args, SetupOptions& setup);
bool parse_gesture_option(std::string_view name, Args& args, GestureOptions& gesture);

/* Cross-checks once every option is read (panning needs stereo, filters need the rate, ...). */
void finish_setup(SetupOptions& setup);

/* The command line of a gesture command (render, play): --help prints `help` with the shared
 * help and returns false; the shared options are taken here, any other by `own`, which returns
 * false for a name that is not its own (a usage error naming `command`). Then the setup is
 * cross-checked and the library's chatter set. */
bool read_gesture_command(Args& args, const char* command, const char* help, SetupOptions& setup,
                          GestureOptions& gesture,
                          const std::function<bool(const std::string&)>& own);

/* Help text of the shared options. */
extern const char* const kSetupHelp;
extern const char* const kGestureHelp;

const char* filter_type_name(uint32_t type);
const char* slot_name(int slot);

}  // namespace kova_tool

#endif
