// SPDX-License-Identifier: Apache-2.0
/* Command line of the kova tool: help, exit codes, and that refused commands say why in one line
 * and leave existing files alone. */
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "support/tool_run.h"

namespace kova_test {
namespace {

/* A command and the parts of what it prints. */
struct Case {
    std::vector<std::string> args;
    std::vector<std::string> parts;
};

/* Runs `c`: exit `code`, and every part in standard output on success, otherwise in the one line
 * on standard error. */
void expect_run(const Case& c, const TempDir& dir, int code) {
    const RunResult r = run_kova(c.args, dir.path);
    SCOPED_TRACE(testing::PrintToString(c.args));
    EXPECT_EQ(r.code, code);
    if (code != 0) {
        EXPECT_EQ(std::count(r.err.begin(), r.err.end(), '\n'), 1) << r.err;
    }
    const std::string& text = code ? r.err : r.out;
    for (const std::string& part : c.parts) EXPECT_TRUE(has(text, part)) << text;
}

TEST(KovaCli, HelpListsCommandsOptionsAndStartingTuneValues) {
    const Case cases[] = {
        {{"--help"}, {"render", "play", "save", "inspect", "gesture"}},
        {{"render", "--help"},
         {"--gesture", "--png", "built-in   1     0.2   1         0.2       1       1",
          "--loop     1     0.4   1         0.2       0       0.4       0.6"}},
        {{"play", "--help"}, {"--capture"}},
        {{"--version"}, {"kova 1."}},
    };
    TempDir dir;
    for (const Case& c : cases) expect_run(c, dir, 0);
}

/* Exit 2 and one line on standard error naming what was wrong: with every listed part. */
TEST(KovaCli, UsageErrorsNameTheValueAndTheRange) {
    const Case cases[] = {
        {{}, {}},
        {{"paint"}, {"paint"}},
        {{"render", "--colour", "red"}, {"--colour"}},
        {{"render", "--rate", "48001"}, {"48001", "8000..48000"}},
        {{"render", "--channels", "3"}, {"3", "1..2"}},
        {{"render", "--gain", "1.5"}, {"1.5", "0..1"}},
        {{"render", "--pan", "-0.1"}, {"-0.1", "0..1"}},
        {{"render", "--end-gain", "abc"}, {"abc", "0..1"}},
        {{"render", "--thickness", "1.01"}, {"1.01", "0..1"}},
        {{"render", "--touch-rate", "500"}, {"500", "10..300"}},
        {{"render", "--screen", "0x2280"}, {"0", "1..100000"}},
        {{"render", "--filter", "bandpass:30000:100"}, {"30000", "1..23999"}},
        {{"render", "--rate", "16000", "--filter", "lowpass:9000"}, {"9000", "1..7999"}},
        {{"render", "--png-size", "100x500"}, {"100", "400..8000"}},
        {{"save", "-o", "x.kset", "--repeat", "loop=0:5000"}, {"5000", "0..1000"}},
        {{"save", "-o", "x.kset", "--repeat", "loop=600:100"}, {"600", "after end 100"}},
        {{"save", "-o", "x.kset", "--repeat", "loop=900:", "--repeat", "loop=:800"},
         {"900", "after end 800"}},
        {{"play", "--osc", "1"}, {"'1'", "on or off"}},
        {{"render", "--channels", "1", "--panning", "on"}, {"--channels 2"}},
        {{"render", "--filter", "lowpass:1000", "--filter", "lowpass:2000"}, {"lowpass"}},
        {{"render", "--start", "tick.raw"}, {"--loop"}},  // a start sound without a loop
        {{"save", "--thickness", "0.5", "-o", "x"}, {"--thickness"}},
        {{"save"}, {"-o"}},
        {{"gesture", "zigzag"}, {"zigzag"}},
        {{"inspect"}, {}},
    };
    TempDir dir;
    for (const Case& c : cases) expect_run(c, dir, 2);
    EXPECT_EQ(count_files(dir.path), 0u) << "a refused command wrote a file";
}

/* Exit 1 and one line naming the file and the fault; an existing output stays as it was and no
 * temporary file is left behind. */
TEST(KovaCli, FailuresExitOneAndKeepTheOutput) {
    TempDir dir;
    const std::string keep = "previous contents";
    write_file(dir.file("out.wav"), keep);
    write_file(dir.file("bad.csv"), "time_ms,action,x,y\n0,down,10,10\n8,wiggle,20,20\n");
    write_file(dir.file("late.csv"), "time_ms,action,x,y\n100,down,10,10\n50,move,20,20\n");
    write_file(dir.file("one.raw"), "x");
    write_file(dir.file("noise.bin"), "not a sound");
    ASSERT_EQ(mkfifo(dir.file("fifo").c_str(), 0600), 0);
    write_file(dir.file("big.csv"), "");
    ASSERT_EQ(truncate(dir.file("big.csv").c_str(), (64 << 20) + 1), 0);  // one byte too many
    const std::string no_device = "kova-test-no-such-device";

    const Case cases[] = {
        {{"render", "--gesture", "nothere.csv"}, {"nothere.csv"}},
        {{"render", "--gesture", "bad.csv"}, {"bad.csv:3:"}},
        {{"render", "--gesture", "late.csv"}, {"late.csv:3:"}},
        {{"render", "--gesture", "/dev/zero"}, {"device, not a regular file"}},
        {{"render", "--gesture", "fifo"}, {"FIFO, not a regular file"}},
        {{"render", "--gesture", "big.csv"}, {"more than the 67108864 accepted"}},
        {{"render", "--loop", "one.raw"}, {"a loop sound needs at least 240 (5 ms)"}},
        {{"render", "--loop", "noise.bin"}, {"--raw"}},
        {{"render", "--set", "."}, {"it is a folder"}},
        {{"render", "--set", "noset.kset"}, {"noset.kset"}},
        {{"render", "--set", "bad.csv"}, {"not a source-set file"}},
        {{"inspect", "one.raw"}, {"not a source-set file"}},
        {{"render", "--gesture", "fast", "-o", "fifo"}, {"FIFO, not a regular file"}},
        {{"render", "--gesture", "fast", "-o", "no/such/dir/out.wav"}, {"no/such/dir/out.wav"}},
        {{"play", "--gesture", "fast", "--device", no_device}, {"no sound device", "--capture"}},
    };
    for (Case c : cases) {
        if (c.args[0] == "render" && c.args[c.args.size() - 2] != "-o") {
            c.args.insert(c.args.end(), {"-o", "out.wav"});
        }
        expect_run(c, dir, 1);
        EXPECT_EQ(read_file(dir.file("out.wav")), keep);
    }
    EXPECT_EQ(count_files(dir.path), 7u) << "a failed command left a file behind";
}

/* A link is written through to its target; "-" is standard output, with the report on stderr. */
TEST(KovaCli, OutputsThroughLinksAndToStandardOutput) {
    TempDir dir;
    write_file(dir.file("target.wav"), "old");
    ASSERT_EQ(symlink("target.wav", dir.file("link.wav").c_str()), 0);
    RunResult r = run_kova({"render", "--gesture", "fast", "-o", "link.wav"}, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
    struct stat st {};
    ASSERT_EQ(lstat(dir.file("link.wav").c_str(), &st), 0);
    EXPECT_TRUE(S_ISLNK(st.st_mode)) << "the link was replaced";
    const std::string wav = read_file(dir.file("target.wav"));
    r = run_kova({"render", "--gesture", "fast", "-o", "-"}, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_TRUE(r.out == wav) << "standard output holds the same WAV";
    EXPECT_TRUE(has(r.err, "wrote -")) << r.err;
    r = run_kova({"-q", "render", "--gesture", "fast", "-o", "q.wav"}, dir.path);
    EXPECT_EQ(r.code, 0);
    EXPECT_EQ(r.out + r.err, "") << "-q prints nothing";
    EXPECT_TRUE(read_file(dir.file("q.wav")) == wav);
}

}  // namespace
}  // namespace kova_test
