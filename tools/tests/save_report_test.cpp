/* kova save and kova inspect: a saved set read back through the file queries, as JSON. */
#include <gtest/gtest.h>

#include <sstream>

#include <nlohmann/json.hpp>
#include <sndfile.h>
#include "support/tool_run.h"

namespace kova_test {
namespace {

/* Built-in start (40 ms) and end (120 ms) sounds and a noise loop (1 s) at 48000 Hz stereo. */
constexpr int kStartBytes = 40 * 192;
constexpr int kLoopBytes = 192000;
constexpr int kEndBytes = 120 * 192;
/* Record sizes of the file layout: count, filter, tune set, slot table, source record. */
constexpr int kCount = 4, kFilter = 40, kTune = 88, kInfo = 20, kRecord = 48;

const std::vector<std::string> kSaveArgs = {
    "save",        "-o",           "set.kset",    "--filter",    "bandpass:2000:1000",
    "--filter",    "lowpass:6000", "--start",     "builtin",     "--end",
    "builtin",     "--gain",       "0.7",         "--pan",       "0.3",
    "--osc-depth", "0.5",          "--sharpness", "0.25",        "--wn-gain",
    "0.6",         "--start-gain", "0.5",         "--loop-gain", "0.8",
    "--end-gain",  "0.7",          "--repeat",    "loop=100:900"};

/* The object's fields named in `keys` (separated by spaces) hold `values`, in that order. */
using Json = nlohmann::json;

void expect_numbers(const Json& object, const std::string& keys,
                    const std::vector<double>& values) {
    std::istringstream names(keys);
    std::string key;
    for (double value : values) {
        ASSERT_TRUE(names >> key);
        EXPECT_EQ(object.value(key, -1.0), value) << key;
    }
    EXPECT_FALSE(names >> key) << "no value for " << key;
}

TEST(KovaSaveInspect, JsonShowsWhatWasSaved) {
    TempDir dir;
    RunResult r = run_kova(kSaveArgs, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    r = run_kova({"inspect", "--json", "set.kset"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    const Json j = Json::parse(r.out);

    const int first = kCount + 2 * kFilter + kTune + kInfo + kRecord;
    const int loop_at = first + kStartBytes + kRecord, end_at = loop_at + kLoopBytes + kRecord;
    const Json& slots = j["slots"];
    expect_numbers(slots["start"], "offset size length_ms", {first, kStartBytes, 40});
    expect_numbers(slots["loop"], "offset size length_ms repeat_start_ms repeat_end_ms",
                   {loop_at, kLoopBytes, 1000, 100, 900});
    expect_numbers(slots["end"], "offset size repeat_end_ms", {end_at, kEndBytes, 120});
    EXPECT_EQ(file_size(dir.file("set.kset")), end_at + kEndBytes);

    const Json& filters = j["filters"];
    ASSERT_EQ(filters.size(), 2u);
    EXPECT_EQ(filters[0]["type"], "lowpass");
    EXPECT_EQ(filters[0]["freq"], 6000);
    EXPECT_EQ(filters[1]["type"], "bandpass");
    expect_numbers(filters[1], "freq bandwidth enable samplerate channels",
                   {2000, 1000, 1, 48000, 2});
    // Read back, a noise level lives in file_gain: the saved set plays its loop as loud.
    expect_numbers(j["tune"],
                   "gain pan osc_enable osc_depth sharp_enable sharpness start_gain loop_gain "
                   "end_gain file_gain wn_gain",
                   {0.7, 0.3, 1, 0.5, 1, 0.25, 0.5, 0.8, 0.7, 0.6, 0.0});
}

TEST(KovaSaveInspect, TextListsSlotsFiltersAndTune) {
    TempDir dir;
    ASSERT_EQ(run_kova({"save", "-o", "s.kset", "--filter", "highpass:300"}, dir.path()).code, 0);
    const RunResult r = run_kova({"inspect", "s.kset"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_NE(r.out.find("highpass"), std::string::npos) << r.out;
    EXPECT_NE(r.out.find("(empty)"), std::string::npos) << "a filter set has no start sound";
    EXPECT_NE(r.out.find("repeat 0..1000 ms"), std::string::npos) << r.out;
    EXPECT_EQ(r.out.find("kova_get_"), std::string::npos) << "library chatter in the output";
}

TEST(KovaSaveInspect, SavedSetRendersAndSavingReplacesALongerFile) {
    TempDir dir;
    write_file(dir.file("set.kset"), std::string(400000, 'x'));
    ASSERT_EQ(run_kova(kSaveArgs, dir.path()).code, 0);
    const int64_t exact =
        kCount + 2 * kFilter + kTune + kInfo + 3 * kRecord + kStartBytes + kLoopBytes + kEndBytes;
    EXPECT_EQ(file_size(dir.file("set.kset")), exact)
        << "old bytes beyond the new set stay in the file";

    RunResult r =
        run_kova({"render", "--set", "set.kset", "--gesture", "fast", "-o", "f.wav"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    const Wav w = read_wav(dir.file("f.wav"));
    EXPECT_GT(rms(w, 0, w.frames()), 100.0);

    // Saving a saved set again with a new end sound keeps the rest.
    write_file(dir.file("click.raw"), std::string(960, '\x40'));
    r = run_kova({"save", "--set", "set.kset", "--end", "click.raw", "-o", "again.kset"},
                 dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    r = run_kova({"inspect", "--json", "again.kset"}, dir.path());
    Json j = Json::parse(r.out);
    EXPECT_EQ(j["slots"]["end"]["size"], 960);
    EXPECT_EQ(j["slots"]["start"]["size"], kStartBytes);
    EXPECT_EQ(j["tune"]["gain"], 0.7);
    EXPECT_EQ(j["tune"]["file_gain"], 0.6);

    // A loop from a mono 24 kHz WAV is stored converted: 0.5 s at 48 kHz stereo.
    write_tone(dir.file("tone.wav"), SF_FORMAT_WAV | SF_FORMAT_PCM_16, 24000, 1, 0.5);
    r = run_kova({"save", "--set", "set.kset", "--loop", "tone.wav", "-o", "wav.kset"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    j = Json::parse(run_kova({"inspect", "--json", "wav.kset"}, dir.path()).out);
    EXPECT_NEAR(j["slots"]["loop"]["size"].get<double>(), 96000, 16);
}

TEST(KovaSaveInspect, InspectRefusesFilesThatAreNoSourceSet) {
    TempDir dir;
    write_file(dir.file("huge.bin"), std::string("\xff\xff\xff\x7f", 4) + std::string(200, '\0'));
    write_file(dir.file("short.bin"), "ab");
    for (const char* f : {"huge.bin", "short.bin"}) {
        const RunResult r = run_kova({"inspect", f}, dir.path());
        EXPECT_EQ(r.code, 1) << f;
        EXPECT_NE(r.err.find("not a source-set file"), std::string::npos) << r.err;
        EXPECT_EQ(count_lines(r.err), 1);
    }
    EXPECT_EQ(run_kova({"inspect"}, dir.path()).code, 2);
}

}  // namespace
}  // namespace kova_test
