// SPDX-License-Identifier: Apache-2.0
/* kova save and kova inspect: a saved set read back through the file queries, as JSON and text,
 * and played again. */
#include <gtest/gtest.h>
#include <sndfile.h>

#include <filesystem>
#include <nlohmann/json.hpp>

#include "support/tool_run.h"

namespace kova_test {
namespace {

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
    const RunResult r = run_kova(kSaveArgs, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
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
    EXPECT_EQ(j["tune"]["file_gain"], 0.6);

    write_tone(dir.file("tone.wav"), SF_FORMAT_WAV | SF_FORMAT_PCM_16, 24000, 1, 0.5);
    r = run_kova({"save", "--set", "set.kset", "--loop", "tone.wav", "-o", "wav.kset"}, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_NEAR(inspect(dir, "wav.kset")["slots"]["loop"]["size"].get<double>(), 96000, 16);
}

}  // namespace
}  // namespace kova_test
