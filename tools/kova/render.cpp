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

const char* const kHelp =
    "Usage: kova render [options]\n"
    "Plays a gesture through the engine and writes the sound as a WAV file, and on request a\n"
    "picture of it (waveform and spectrogram). Blocks are queued one after another, as the live\n"
    "stream plays them; a pause between strokes is silent up to the next event's time.\n"
    "\n"
    "Output:\n"
    "  -o, --output FILE    WAV file to write (default stroke.wav)\n"
    "  --png FILE           also write a PNG picture of the sound\n"
    "  --png-size WxH       picture size, 400..8000 x 300..4000 (default 1200x720)\n"
    "  --thickness X        equaliser thickness, 0..1 (default: the set's, 0.6)\n"
    "  --volume X           output volume, 0..1 (default 1)\n"
    "  -v, --verbose        also show the library's own diagnostic lines\n";

/* Warns once when the gesture leaves the screen given by --screen: panning reads x against the
 * width, so positions outside it pan beyond the edge. */
void check_on_screen(const std::vector<TouchEvent>& events, const KOVA_FORMAT& f) {
    for (const TouchEvent& e : events) {
        if (e.x > static_cast<float>(f.w) || e.y > static_cast<float>(f.h)) {
            std::fprintf(stderr,
                         "kova render: warning: the gesture reaches (%g, %g), outside the %ux%u "
                         "screen (see --screen)\n",
                         static_cast<double>(e.x), static_cast<double>(e.y), f.w, f.h);
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

}  // namespace

int run_render(Args& args) {
    SetupOptions setup;
    GestureOptions gesture;
    std::string output = "stroke.wav";
    std::optional<std::string> png;
    PictureOptions picture;
    const auto own = [&](const std::string& name) {
        if (name == "-o" || name == "--output") {
            output = args.value(name);
        } else if (name == "--png") {
            png = args.value(name);
        } else if (name == "--png-size") {
            std::tie(picture.width, picture.height) =
                parse_size(name, args.value(name), kPictureMinWidth, kPictureMaxWidth,
                           kPictureMinHeight, kPictureMaxHeight);
        } else {
            return false;
        }
        return true;
    };
    if (!read_gesture_command(args, "render", kHelp, setup, gesture, own)) return kExitOk;

    const KOVA_FORMAT fmt = setup.format.format();
    const std::vector<TouchEvent> events = load_gesture(gesture, fmt.w, fmt.h);
    check_on_screen(events, fmt);

    // Both files are created first, so a folder that cannot be written fails before any work,
    // and they replace their targets together once both are complete.
    OutputFile wav_file(output);
    std::unique_ptr<OutputFile> png_file;
    if (png) png_file = std::make_unique<OutputFile>(*png);

    Engine engine(setup.format);
    prepare_set(engine, setup);

    Timeline timeline(fmt.sample_rate, fmt.channels);
    std::vector<int16_t> block(kBlockBytes / 2);
    size_t moves = 0, silent_moves = 0;
    const size_t max_frames = static_cast<size_t>(kMaxRenderSeconds) * fmt.sample_rate;
    for (const TouchEvent& e : events) {
        const int32_t bytes = generate_event(engine, e, block);
        if (e.action == KOVA_ACTION_MOVE) {
            ++moves;
            if (bytes <= 0) ++silent_moves;
        }
        timeline.place(e.time_ms, e.action, block.data(),
                       bytes > 0 ? static_cast<size_t>(bytes) / 2 : 0);
        if (timeline.frames() > max_frames) {
            failure("the sound would last longer than " + std::to_string(kMaxRenderSeconds) +
                    " s (at the event at " + std::to_string(e.time_ms) +
                    " ms); render shorter gestures");
        }
    }

    write_wav(wav_file, timeline.pcm(), fmt.sample_rate, fmt.channels);
    if (png_file) {
        picture.title = output;
        write_picture(*png_file, timeline.pcm(), fmt.sample_rate, fmt.channels, timeline.segments(),
                      picture);
    }
    wav_file.commit();
    if (png_file) png_file->commit();

    const double seconds = static_cast<double>(timeline.frames()) / fmt.sample_rate;
    std::fprintf(out(),
                 "gesture: %zu events, %zu moves, %zu of them too short or too small to sound\n",
                 events.size(), moves, silent_moves);
    std::fprintf(out(), "wrote %s: %.3f s, %u Hz, %u channel%s, peak %.1f dBFS\n", output.c_str(),
                 seconds, fmt.sample_rate, fmt.channels, fmt.channels == 1 ? "" : "s",
                 peak_dbfs(timeline.pcm()));
    if (timeline.frames() == 0)
        std::fprintf(stderr, "kova render: warning: the gesture made no sound\n");
    if (png) {
        std::fprintf(out(), "wrote %s: %ux%u picture\n", png->c_str(), picture.width,
                     picture.height);
    }
    return kExitOk;
}

}  // namespace kova_tool
