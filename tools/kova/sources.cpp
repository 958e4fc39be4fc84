// SPDX-License-Identifier: Apache-2.0
#include "sources.h"

#include <kova/kova_engine.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <vector>

#include "builtin_set.h"
#include "builtin_sounds.h"
#include "scratch_dir.h"
#include "sound_input.h"
#include "savefile_check.h"

namespace kova_tool {
namespace {

void check(int32_t code, const std::string& what) {
    if (code != KOVA_OK) failure(what + ": " + library_error(code));
}

/* Slot paths for the engine: every sound converted to its format and written to the scratch
 * folder (the engine reads raw PCM files only), empty slots null. */
struct SlotPaths {
    std::string path[KOVA_SLOT_COUNT];
    const char* ptr[KOVA_SLOT_COUNT] = {nullptr, nullptr, nullptr};
    bool any = false;
};

SlotPaths slot_paths(const SourceOptions& src, const KOVA_FORMAT& fmt, ScratchDir& scratch) {
    SlotPaths p;
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
        const std::string& given = src.slot[static_cast<size_t>(s)];
        if (given.empty()) continue;
        const std::string name = std::string(slot_name(s)) + ".pcm";
        if (given == kBuiltinSound) {
            p.path[s] = scratch.write(
                name,
                s == KOVA_SLOT_START
                    ? builtin_start_sound(fmt.sample_rate, fmt.channels, KOVA_SLOT_START_MAX_BYTES)
                    : builtin_end_sound(fmt.sample_rate, fmt.channels, KOVA_SLOT_END_MAX_BYTES));
        } else {
            p.path[s] = scratch.write(name, read_sound(given, s, fmt, src.raw));
        }
        if (p.path[s].empty()) failure("cannot write the " + name + " sound to a temporary folder");
        p.ptr[s] = p.path[s].c_str();
        p.any = true;
    }
    return p;
}

void apply_repeats(Engine& engine, int32_t id, const std::vector<RepeatArg>& repeats) {
    if (repeats.empty()) return;
    KOVA_RPT_INFO now{};
    check(kova_get_rptinfo(engine.ctx(), id, &now), "reading the repeat points");
    KOVA_RPT_INFO want{};
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) want.rpt_start_ms[s] = want.rpt_end_ms[s] = -1;
    for (const RepeatArg& r : repeats) {
        const std::string opt = std::string("--repeat ") + slot_name(r.slot);
        const int64_t len = now.len_ms[r.slot];
        if (len <= 0) usage_error(opt + ": the set has no " + slot_name(r.slot) + " sound");
        const std::string range =
            " is out of range (accepted: 0.." + std::to_string(len) + " ms, the sound's length)";
        if (r.start_ms > len) usage_error(opt + " start " + std::to_string(r.start_ms) + range);
        if (r.end_ms > len) usage_error(opt + " end " + std::to_string(r.end_ms) + range);
        // A loop that ends before its first millisecond has nothing to repeat.
        if (r.slot == KOVA_SLOT_LOOP && r.end_ms == 0) {
            usage_error(opt + " end 0 is out of range (accepted: 1.." + std::to_string(len) +
                        " ms)");
        }
        // A number left out keeps the value before, so the order is checked on the result.
        if (r.start_ms >= 0) want.rpt_start_ms[r.slot] = now.rpt_start_ms[r.slot] = r.start_ms;
        if (r.end_ms >= 0) want.rpt_end_ms[r.slot] = now.rpt_end_ms[r.slot] = r.end_ms;
        if (now.rpt_start_ms[r.slot] > now.rpt_end_ms[r.slot]) {
            usage_error(opt + ": start " + std::to_string(now.rpt_start_ms[r.slot]) +
                        " is after end " + std::to_string(now.rpt_end_ms[r.slot]) +
                        " (START_MS must not exceed END_MS)");
        }
    }
    check(kova_set_rptinfo(engine.ctx(), id, &want), "setting the repeat points");
}

/* Oscillator and resampling pairs: a depth turns the effect on; on/off alone keeps the depth. The
 * engine takes a pair only with its depth in 0..1, so a depth outside that (possible in a file)
 * needs a new one. */
void apply_pair(std::string_view name, std::string_view depth_name, const std::optional<bool>& on,
                const std::optional<double>& depth, int32_t& enable, double& value) {
    if (depth) {
        enable = 1;
        value = *depth;
    } else if (on) {
        enable = *on ? 1 : 0;
        if (*on && !(value >= 0.0 && value <= 1.0)) {
            usage_error(std::string(name) + " on: the set's " + std::string(depth_name) + " " +
                        num(value) + " is out of range (accepted: 0..1); give " +
                        std::string(depth_name) + " too");
        }
    }
}

void apply_tune(Engine& engine, int32_t id, const TuneOptions& t, const KOVA_TUNE_SET& base) {
    KOVA_TUNE_SET tune = base;
    const std::pair<const std::optional<double>&, double&> given[] = {
        {t.gain, tune.gain},
        {t.pan, tune.pan},
        {t.wn_gain, tune.wn_gain},
        {t.file_gain, tune.file_gain},
        {t.start_gain, tune.start_gain},
        {t.loop_gain, tune.loop_gain},
        {t.end_gain, tune.end_gain}};
    for (const auto& [value, field] : given) field = value.value_or(field);
    apply_pair("--osc", "--osc-depth", t.osc, t.osc_depth, tune.osc_enable, tune.osc_depth);
    apply_pair("--sharp", "--sharpness", t.sharp, t.sharpness, tune.sharp_enable, tune.sharpness);
    check(kova_set_tuneset(engine.ctx(), id, &tune), "setting the tune set");
}

}  // namespace

Engine::Engine(const FormatOptions& opts) : format_(opts.format()) {
    int32_t err = KOVA_OK;
    ctx_ = kova_init(&format_, &err);
    if (!ctx_) failure("the engine could not be created: " + library_error(err));
}

Engine::~Engine() {
    if (ctx_) kova_deinit(ctx_);
}

int32_t generate_event(const Engine& engine, const TouchEvent& e, std::vector<int16_t>& block) {
    const KOVA_PARAM p{e.x, e.y, e.time_ms, e.aux, e.action};
    KOVA_PCMBUF buf{block.data(), static_cast<int32_t>(block.size() * sizeof(int16_t))};
    return kova_gen_sounds(engine.ctx(), &p, &buf);
}

std::string library_error(int32_t code) {
    static const char* const what[] = {"format rejected", "out of memory", "invalid parameter",
                                       "sound source could not be loaded", "too many source sets"};
    return std::string(code <= -1 && code >= -5 ? what[-code - 1] : "unknown error") +
           " (library code " + std::to_string(code) + ")";
}

namespace {

/* A saved set plays its samples as they are: at another format they play at another pitch. */
void note_saved_format(const SourceOptions& src, const KOVA_FORMAT& fmt) {
    const SavedFormat saved = check_source_set_file(src.set_path, src.slot[KOVA_SLOT_LOOP].empty());
    if (saved.rate != static_cast<int32_t>(fmt.sample_rate) ||
        saved.channels != static_cast<int32_t>(fmt.channels)) {
        note(in_quotes(src.set_path) + " was saved for " + std::to_string(saved.rate) + " Hz, " +
             std::to_string(saved.channels) + " channel(s); it plays at " +
             std::to_string(fmt.sample_rate) + " Hz, " + std::to_string(fmt.channels) +
             " channel(s)");
    }
}

/* How a set is registered: its id, which filters are still to attach, and whether the given
 * sound files then replace the registered slots. */
struct Registration {
    PreparedSet set;
    size_t first_attached = 0;
    bool replace_slots = false;
};

/* An id of 0 is a failure; each registration call presets `err`, read here only after the call
 * (hence the reference: argument order is unspecified). */
int32_t need(int32_t id, const int32_t& err, const std::string& what) {
    if (id == 0) failure("cannot " + what + ": " + library_error(err));
    return id;
}

/* The one registration the options ask for: the built-in set, a saved set, sound files or the
 * first filter's noise. */
Registration register_set(KOVA_CTX* ctx, const SourceOptions& src, const KOVA_FORMAT& fmt,
                          const SlotPaths& paths) {
    Registration r;
    int32_t err = KOVA_OK;
    if (src.builtin()) {
        r.set.id = need(register_builtin_set(ctx, fmt, &err), err, "register the built-in set");
        r.set.noise_loop = true;
    } else if (!src.set_path.empty()) {
        r.set.id = need(kova_reg_src_bysavefile(ctx, src.set_path.c_str(), &err), err,
                        "register source-set file " + in_quotes(src.set_path));
        r.replace_slots = paths.any;
    } else if (!src.slot[KOVA_SLOT_LOOP].empty()) {
        r.set.id =
            need(kova_reg_src_byfiles(ctx, paths.ptr, &err), err, "register the sound files");
    } else {
        r.set.id = need(kova_reg_src_byfilter(ctx, &src.filters[0].dsc, &err), err,
                        "register filter " + in_quotes(src.filters[0].text));
        r.set.noise_loop = true;
        r.first_attached = 1;
        r.replace_slots = paths.any;
    }
    return r;
}

}  // namespace

PreparedSet prepare_set(Engine& engine, const SetupOptions& setup) {
    const KOVA_FORMAT& fmt = engine.format();
    const SourceOptions& src = setup.source;
    if (!src.set_path.empty()) note_saved_format(src, fmt);

    ScratchDir scratch; /* kept until the filters are attached: they reload file sounds */
    const SlotPaths paths = slot_paths(src, fmt, scratch);
    KOVA_CTX* ctx = engine.ctx();
    Registration r = register_set(ctx, src, fmt, paths);
    PreparedSet& set = r.set;

    KOVA_TUNE_SET base{};
    check(kova_get_tuneset(ctx, set.id, &base), "reading the tune set");
    int32_t err = KOVA_OK;
    if (r.replace_slots) {
        need(kova_update_src_byfiles(ctx, set.id, paths.ptr, &err), err,
             "load the start/loop/end sounds");
        if (paths.ptr[KOVA_SLOT_LOOP]) {
            // A new loop file takes the levels a file registration gives.
            set.noise_loop = false;
            check(kova_get_tuneset(ctx, set.id, &base), "reading the tune set");
        }
        // Otherwise the set keeps its levels: replacing only the start or end sound should not
        // change how loud the loop plays.
    }
    for (size_t i = r.first_attached; i < src.filters.size(); ++i) {
        need(kova_attach_filter(ctx, set.id, &src.filters[i].dsc, &err), err,
             "attach filter " + in_quotes(src.filters[i].text));
    }

    check(kova_set_active_src(ctx, set.id), "selecting the source set");
    apply_repeats(engine, set.id, src.repeats);
    apply_tune(engine, set.id, setup.tune, base);
    if (setup.thickness) check(kova_set_thickness(ctx, *setup.thickness), "setting the thickness");
    if (setup.volume) check(kova_set_volume(ctx, *setup.volume), "setting the volume");
    return set;
}

}  // namespace kova_tool
