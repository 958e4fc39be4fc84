// SPDX-License-Identifier: Apache-2.0
/* kova render, save and inspect: the WAV file read back with libsndfile, the PNG with cairo, a
 * saved set through the file queries (as JSON and text) and played again. */
#include <cairo.h>
#include <gtest/gtest.h>
#include <sndfile.h>

#include <filesystem>
#include <nlohmann/json.hpp>
#include <set>

#include "support/tool_run.h"

namespace kova_test {
namespace {

/* Lengths of the built-in start and end sounds, as documented. */
constexpr size_t kStartMs = 40, kEndMs = 120;

/* Two strokes of 1 px/ms with a pause: moves from 10 to 500 ms and from 1510 to 1800 ms. */
const std::string kTwoStrokes = "time_ms,action,x,y,aux\n# two strokes\n" +
                                stroke_csv(0, 500, 100) + "\n" + stroke_csv(1500, 1800, 500);

/* Blocks queue back to back within a stroke (start sound, one block per move as long as the time
 * since the event before, end sound); the pause is silent and the second stroke starts at its own
 * time. */
TEST(KovaRender, PlacesBlocksByTimeWithSilentPauses) {
    TempDir dir;
    write_file(dir.file("g.csv"), kTwoStrokes);
    for (const auto& [rate, channels] : {std::pair{48000, 2}, {16000, 1}, {44100, 2}}) {
        SCOPED_TRACE(rate);
        const RunResult r =
            run_kova({"render", "--gesture", "g.csv", "--rate", std::to_string(rate), "--channels",
                      std::to_string(channels), "-o", "g.wav"},
                     dir.path);
        ASSERT_EQ(r.code, 0) << r.err;
        const Wav w = read_wav(dir.file("g.wav"));
        EXPECT_EQ(w.rate, rate);
        EXPECT_EQ(w.channels, channels);
        auto frames = [&](size_t ms) { return static_cast<size_t>(rate) * ms / 1000; };
        const size_t start = frames(kStartMs), end = frames(kEndMs);
        const size_t loop1 = 50 * frames(10), loop2 = 30 * frames(10);
        const size_t stroke1_end = start + loop1 + end, stroke2 = frames(1500);
        ASSERT_EQ(w.frames(), stroke2 + start + loop2 + end);
        EXPECT_GT(rms(w, 0, start), 300.0) << "start sound";
        EXPECT_GT(rms(w, start, start + loop1), 300.0) << "loop while moving";
        EXPECT_GT(rms(w, start + loop1, stroke1_end), 100.0) << "end sound";
        EXPECT_EQ(peak(w, stroke1_end, stroke2), 0) << "the pause between strokes";
    }
}

/* The gesture command prints the built-in gestures as CSV, which reads back with a spreadsheet's
 * byte-order mark in front; without options, render plays those strokes, loud enough to hear next
 * to other sounds with headroom (a peak of -6 to -1 dBFS). */
TEST(KovaRender, DefaultsRenderTheGestureTheGestureCommandPrints) {
    TempDir dir;
    ASSERT_EQ(run_kova({"gesture", "strokes", "-o", "s.csv"}, dir.path).code, 0);
    const std::string csv = read_file(dir.file("s.csv"));
    EXPECT_EQ(csv.rfind("time_ms,action,x,y,aux\n0,down,", 0), 0u) << csv.substr(0, 200);
    write_file(dir.file("s.csv"), "\xEF\xBB\xBF" + csv);
    ASSERT_EQ(run_kova({"render", "--gesture", "s.csv", "-o", "csv.wav"}, dir.path).code, 0);
    ASSERT_EQ(run_kova({"render", "-o", "stroke.wav"}, dir.path).code, 0);
    const Wav w = read_wav(dir.file("stroke.wav"));
    EXPECT_EQ(w.frames(), read_wav(dir.file("csv.wav")).frames());
    EXPECT_GE(peak(w, 0, w.frames()), 16423);
    EXPECT_LE(peak(w, 0, w.frames()), 29205);
    const RunResult r = run_kova({"gesture", "fast", "--touch-rate", "60", "-o", "-"}, dir.path);
    EXPECT_TRUE(has(r.out, "\n17,move,") && !has(r.out, "\n8,move,")) << "every 16 or 17 ms";
}

/* Frequency of channel 0 over the first moves of the first stroke, by zero crossings. */
double loop_hz(const Wav& w) {
    const size_t last = std::min<size_t>(50 * 480, w.frames());
    int crossings = 0;
    for (size_t i = 1; i < last; ++i) {
        crossings += (w.samples[(i - 1) * w.channels] < 0) != (w.samples[i * w.channels] < 0);
    }
    return crossings / 2.0 / (last / 48000.0);
}

/* Loops from sound files: raw PCM as it is, a WAV in the engine's format exactly as its samples,
 * and other formats converted (rate, channels, sample type) so the tone keeps its pitch. */
TEST(KovaRender, SoundFilesKeepTheirSamplesOrTheirPitch) {
    TempDir dir;
    write_file(dir.file("g.csv"), kTwoStrokes);
    write_tone(dir.file("tone.wav"), SF_FORMAT_WAV | SF_FORMAT_PCM_16, 48000, 2, 1.0);
    write_tone(dir.file("tone.ogg"), SF_FORMAT_OGG | SF_FORMAT_VORBIS, 22050, 2, 1.0);
    const Wav wav = read_wav(dir.file("tone.wav"));
    write_file(dir.file("tone.raw"), std::string(reinterpret_cast<const char*>(wav.samples.data()),
                                                 wav.samples.size() * 2));
    std::string rendered[3];
    const std::string loops[3] = {"tone.raw", "tone.wav", "tone.ogg"};
    for (int i = 0; i < 3; ++i) {
        SCOPED_TRACE(loops[i]);
        const RunResult r =
            run_kova({"render", "--loop", loops[i], "--gesture", "g.csv", "-o", "o.wav"}, dir.path);
        ASSERT_EQ(r.code, 0) << r.err;
        EXPECT_EQ(has(r.err, "kova: note: converted loop sound"), i >= 2) << r.err;
        EXPECT_NEAR(loop_hz(read_wav(dir.file("o.wav"))), 440.0, 440.0 * 0.03);
        rendered[i] = read_file(dir.file("o.wav"));
    }
    EXPECT_TRUE(rendered[0] == rendered[1]) << "raw and WAV loops differ";
}

/* The picture has the requested (or the default) size, and a drawn waveform and spectrogram take
 * many colours where a blank picture takes a handful. */
TEST(KovaRender, PngHasTheRequestedSizeAndShowsTheSound) {
    TempDir dir;
    for (const auto& [size, width, height] : {std::tuple{"800x500", 800, 500}, {"", 1200, 720}}) {
        std::vector<std::string> args = {"render", "--gesture", "slow", "-o",
                                         "s.wav",  "--png",     "s.png"};
        if (*size) args.insert(args.end(), {"--png-size", size});
        const RunResult r = run_kova(args, dir.path);
        ASSERT_EQ(r.code, 0) << r.err;
        cairo_surface_t* s = cairo_image_surface_create_from_png(dir.file("s.png").c_str());
        ASSERT_EQ(cairo_surface_status(s), CAIRO_STATUS_SUCCESS);
        EXPECT_EQ(cairo_image_surface_get_width(s), width);
        EXPECT_EQ(cairo_image_surface_get_height(s), height);
        std::set<uint32_t> colours;
        const unsigned char* data = cairo_image_surface_get_data(s);
        for (int y = 0; y < height; y += 2) {
            const auto* row =
                reinterpret_cast<const uint32_t*>(data + y * cairo_image_surface_get_stride(s));
            for (int x = 0; x < width; x += 2) colours.insert(row[x] & 0xFFFFFF);
        }
        EXPECT_GT(colours.size(), 200u);
        cairo_surface_destroy(s);
    }
}

using Json = nlohmann::json;

/* Built-in start (40 ms) and end (120 ms) sounds and a noise loop (1 s) at 48000 Hz stereo. */
constexpr int kStartBytes = 40 * 192, kLoopBytes = 192000, kEndBytes = 120 * 192;
/* Record sizes of the file layout: count, filter, tune set, slot table, source record. */
constexpr int kCount = 4, kFilter = 40, kTune = 88, kInfo = 20, kRecord = 48;

const std::vector<std::string> kSaveArgs = {
    "save",        "-o",           "set.kset",    "--filter",    "bandpass:2000:1000",
    "--filter",    "lowpass:6000", "--start",     "builtin",     "--end",
    "builtin",     "--gain",       "0.7",         "--pan",       "0.3",
    "--osc-depth", "0.5",          "--sharpness", "0.25",        "--wn-gain",
    "0.6",         "--start-gain", "0.5",         "--loop-gain", "0.8",
    "--end-gain",  "0.7",          "--repeat",    "loop=100:900"};

Json inspect(const TempDir& dir, const std::string& file) {
    const RunResult r = run_kova({"inspect", "--json", file}, dir.path);
    EXPECT_EQ(r.code, 0) << r.err;
    return Json::parse(r.out, nullptr, false);
}

/* The set is saved over a longer file, which must not keep its old tail. */
TEST(KovaSaveInspect, JsonShowsWhatWasSaved) {
    TempDir dir;
    write_file(dir.file("set.kset"), std::string(400000, 'x'));
    ASSERT_EQ(run_kova(kSaveArgs, dir.path).code, 0);
    const Json j = inspect(dir, "set.kset");

    const int first = kCount + 2 * kFilter + kTune + kInfo + kRecord;
    const int loop_at = first + kStartBytes + kRecord, end_at = loop_at + kLoopBytes + kRecord;
    EXPECT_EQ(std::filesystem::file_size(dir.file("set.kset")), end_at + kEndBytes);
    // Read back, a noise level lives in file_gain: the saved set plays its loop as loud.
    Json want = Json::parse(R"({"slots": {
        "start": {"size": 7680, "length_ms": 40},
        "loop": {"size": 192000, "length_ms": 1000, "repeat_start_ms": 100, "repeat_end_ms": 900},
        "end": {"size": 23040, "repeat_end_ms": 120}},
      "filters": [{"type": "lowpass", "freq": 6000}, {"type": "bandpass", "freq": 2000,
        "bandwidth": 1000, "enable": 1, "samplerate": 48000, "channels": 2}],
      "tune": {"gain": 0.7, "pan": 0.3, "osc_enable": 1, "osc_depth": 0.5, "sharp_enable": 1,
        "sharpness": 0.25, "start_gain": 0.5, "loop_gain": 0.8, "end_gain": 0.7,
        "file_gain": 0.6, "wn_gain": 0.0}})");
    want["slots"]["start"]["offset"] = first;
    want["slots"]["loop"]["offset"] = loop_at;
    want["slots"]["end"]["offset"] = end_at;
    const Json flat = want.flatten();
    for (const auto& [path, value] : flat.items()) {
        EXPECT_EQ(j.value(Json::json_pointer(path), Json()), value) << path;
    }
}

TEST(KovaSaveInspect, TextListsSlotsFiltersAndTune) {
    TempDir dir;
    ASSERT_EQ(run_kova({"save", "-o", "s.kset", "--filter", "highpass:300"}, dir.path).code, 0);
    const RunResult r = run_kova({"inspect", "s.kset"}, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_TRUE(has(r.out, "highpass")) << r.out;
    EXPECT_TRUE(has(r.out, "(empty)")) << "a filter set has no start sound";
    EXPECT_TRUE(has(r.out, "repeat 0..1000 ms")) << r.out;
    EXPECT_FALSE(has(r.out, "kova_get_")) << "library chatter in the output";
}

/* A saved set renders, and saving it again with a new end sound or a loop from a WAV keeps the
 * rest; the WAV (mono, 24 kHz) is stored converted: 0.5 s at 48 kHz stereo. */
TEST(KovaSaveInspect, SavedSetRendersAndSavesAgain) {
    TempDir dir;
    ASSERT_EQ(run_kova(kSaveArgs, dir.path).code, 0);
    RunResult r =
        run_kova({"render", "--set", "set.kset", "--gesture", "fast", "-o", "f.wav"}, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
    const Wav w = read_wav(dir.file("f.wav"));
    EXPECT_GT(rms(w, 0, w.frames()), 100.0);

    write_file(dir.file("click.raw"), std::string(960, '\x40'));
    r = run_kova({"save", "--set", "set.kset", "--end", "click.raw", "-o", "again.kset"}, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
    Json j = inspect(dir, "again.kset");
    EXPECT_EQ(j["slots"]["end"]["size"], 960);
    EXPECT_EQ(j["slots"]["start"]["size"], kStartBytes);
    EXPECT_EQ(j["tune"]["gain"], 0.7);
}

}  // namespace
}  // namespace kova_test
