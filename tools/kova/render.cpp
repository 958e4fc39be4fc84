// SPDX-License-Identifier: Apache-2.0
#include <cmath>
#include <memory>
#include <optional>
#include <tuple>

#include "commands.h"
#include "gesture.h"
#include "output_file.h"
#include "picture.h"
#include "sources.h"
#include "timeline.h"
#include "wav.h"

namespace kova_tool {
namespace {

/* Warns once when the gesture leaves the screen given by --screen: panning reads x against the
 * width, so positions outside it pan beyond the edge. */
void check_on_screen(const std::vector<TouchEvent>& events, const KOVA_FORMAT& f) {
    for (const TouchEvent& e : events) {
        if (e.x > static_cast<float>(f.w) || e.y > static_cast<float>(f.h)) {
            note("the gesture reaches (" + num(e.x) + ", " + num(e.y) + "), outside the " +
                 std::to_string(f.w) + "x" + std::to_string(f.h) + " screen (see --screen)");
            return;
        }
    }
}

/* A rendered file is held in memory whole; ten minutes of 48 kHz stereo is about 115 MB. */
constexpr int kMaxRenderSeconds = 600;

double peak_dbfs(const std::vector<int16_t>& pcm) {
    int peak = 0;
    for (int16_t s : pcm) peak = std::max(peak, std::abs(static_cast<int>(s)));
    return peak == 0 ? -INFINITY : 20.0 * std::log10(peak / 32768.0);
}

struct RenderOptions {
    SetupOptions setup;
    GestureOptions gesture;
    std::string output = "stroke.wav";
    std::optional<std::string> png;
    PictureOptions picture;
};

/* Moves of a gesture, and those too short or too small to sound. */
struct MoveCounts {
    size_t all = 0;
    size_t silent = 0;
};

/* Generates every event and places its block on the timeline at the event's time. */
MoveCounts place_events(Engine& engine, const std::vector<TouchEvent>& events, Timeline& timeline) {
    std::vector<int16_t> block(kBlockBytes / 2);
    MoveCounts moves;
    const size_t max_frames = static_cast<size_t>(kMaxRenderSeconds) * engine.format().sample_rate;
    for (const TouchEvent& e : events) {
        const int32_t bytes = generate_event(engine, e, block);
        if (e.action == KOVA_ACTION_MOVE) {
            ++moves.all;
            if (bytes <= 0) ++moves.silent;
        }
        timeline.place(e.time_ms, e.action, block.data(),
                       bytes > 0 ? static_cast<size_t>(bytes) / 2 : 0);
        if (timeline.frames() > max_frames) {
            failure("the sound would last longer than " + std::to_string(kMaxRenderSeconds) +
                    " s (at the event at " + std::to_string(e.time_ms) +
                    " ms); render shorter gestures");
        }
    }
    return moves;
}

int run_render(RenderOptions& o) {
    SetupOptions& setup = o.setup;
    PictureOptions& picture = o.picture;
    const std::string& output = o.output;
    const std::optional<std::string>& png = o.png;
    finish_setup(setup);
    const KOVA_FORMAT fmt = setup.format.format();
    const std::vector<TouchEvent> events = load_gesture(o.gesture, fmt.w, fmt.h);
    check_on_screen(events, fmt);

    // Both files are created first, so a folder that cannot be written fails before any work,
    // and they replace their targets together once both are complete.
    OutputFile wav_file(output);
    std::unique_ptr<OutputFile> png_file;
    if (png) png_file = std::make_unique<OutputFile>(*png);

    Engine engine(setup.format);
    prepare_set(engine, setup);

    Timeline timeline(fmt.sample_rate, fmt.channels);
    const MoveCounts moves = place_events(engine, events, timeline);

    write_wav(wav_file, timeline.pcm(), fmt.sample_rate, fmt.channels);
    if (png_file) {
        picture.title = output;
        write_picture(*png_file, timeline.pcm(), fmt.sample_rate, fmt.channels, timeline.segments(),
                      picture);
    }
    wav_file.commit();
    if (png_file) png_file->commit();

    const double seconds = static_cast<double>(timeline.frames()) / fmt.sample_rate;
    std::fprintf(info(),
                 "gesture: %zu events, %zu moves, %zu of them too short or too small to sound\n",
                 events.size(), moves.all, moves.silent);
    std::fprintf(info(), "wrote %s: %.3f s, %u Hz, %u channel%s, peak %.1f dBFS\n", output.c_str(),
                 seconds, fmt.sample_rate, fmt.channels, fmt.channels == 1 ? "" : "s",
                 peak_dbfs(timeline.pcm()));
    if (timeline.frames() == 0) note("the gesture made no sound");
    if (png) {
        std::fprintf(info(), "wrote %s: %ux%u picture\n", png->c_str(), picture.width,
                     picture.height);
    }
    return kExitOk;
}

}  // namespace

Run add_render(CLI::App& app) {
    auto o = std::make_shared<RenderOptions>();
    CLI::App* sub = app.add_subcommand(
        "render", "play a gesture through the engine into a WAV file (and a PNG picture)");
    add_gesture_options(*sub, o->gesture);
    sub->add_option("-o,--output", o->output,
                    "WAV file to write, - for standard output (default stroke.wav)")
        ->type_name("FILE")
        ->group("Output");
    sub->add_option_function<std::string>(
           "--png", [o](const std::string& v) { o->png = v; },
           "also write a PNG picture of the sound (waveform and spectrogram)")
        ->type_name("FILE")
        ->group("Output");
    add_size(*sub, "--png-size", o->picture.width, o->picture.height, kPictureMinWidth,
             kPictureMaxWidth, kPictureMinHeight, kPictureMaxHeight,
             "picture size, 400..8000 x 300..4000 (default 1200x720)")
        ->group("Output");
    add_setup_options(*sub, o->setup, true);
    return [o] { return run_render(*o); };
}

}  // namespace kova_tool
