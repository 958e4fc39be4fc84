// SPDX-License-Identifier: Apache-2.0
/* Command line of the kova tool: help, exit codes, and that refused commands say why in one line
 * and leave existing files alone. Then kova play on a machine without the named sound device: it
 * says so, and --capture still runs the stream in real time and writes what the device would have
 * received. */
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>

#include "support/tool_run.h"

namespace kova_test {
namespace {

/* An ALSA device name that exists nowhere, so the tests behave the same with or without a card. */
const std::string kNoDevice = "kova-test-no-such-device";

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

TEST(KovaCli, HelpListsStartingTuneValuesAndVersion) {
    TempDir dir;
    expect_run({{"render", "--help"},
                {"built-in   1     0.2   1         0.2       1       1",
                 "--loop     1     0.4   1         0.2       0       0.4       0.6"}},
               dir, 0);
    expect_run({{"--version"}, {"kova 1."}}, dir, 0);
}

/* Exit 2 and one line on standard error naming what was wrong: with every listed part. */
TEST(KovaCli, UsageErrorsNameTheValueAndTheRange) {
    const Case cases[] = {
        {{}, {}},
        {{"paint"}, {"paint"}},
        {{"render", "--colour", "red"}, {"--colour"}},
        {{"render", "--rate", "48001"}, {"48001", "8000..48000"}},
        {{"render", "--channels", "3"}, {"3", "1..2"}},
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
        {{"render", "--set", "bad.csv"}, {"not a source-set file"}},
        {{"inspect", "one.raw"}, {"not a source-set file"}},
        {{"render", "--gesture", "fast", "-o", "fifo"}, {"FIFO, not a regular file"}},
        {{"render", "--gesture", "fast", "-o", "no/such/dir/out.wav"}, {"no/such/dir/out.wav"}},
        {{"play", "--gesture", "fast", "--device", kNoDevice}, {"no sound device", "--capture"}},
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

TEST(KovaPlay, CaptureHoldsEveryBlockWithoutADevice) {
    TempDir dir;
    // Down, 20 moves of 10 ms at 1 px/ms, up: 40 ms + 200 ms + 120 ms of blocks.
    write_file(dir.file("g.csv"), "time_ms,action,x,y\n" + stroke_csv(0, 200, 100));
    const RunResult r =
        run_kova({"play", "--gesture", "g.csv", "--device", kNoDevice, "--capture", "cap.wav"},
                 dir.path, 0, {}, true);
    ASSERT_EQ(r.code, 0) << r.err;
    // On a terminal, a status line refreshed while it plays: progress as a bar against the
    // gesture's 0.21 s, the ring's fill in ms, the blocks dropped and the underruns.
    const std::string bar = "[" + std::string(24, '#') + "] ";
    for (const std::string& part :
         {bar, std::string(" / 0.21 s   ring "), std::string(" ms   dropped 0   underruns 0")})
        EXPECT_TRUE(has(r.err, part)) << r.err;
    EXPECT_NE(r.err.find("] "), r.err.rfind("] ")) << "refreshed while it plays";
    EXPECT_TRUE(has(r.out, "no sound device")) << r.out;
    const Wav w = read_wav(dir.file("cap.wav"));
    EXPECT_EQ(w.rate, 48000);
    EXPECT_EQ(w.channels, 2);
    EXPECT_EQ(w.frames(), static_cast<size_t>((40 + 200 + 120) * 48));
    EXPECT_GT(rms(w, 0, 40 * 48), 300.0) << "start sound";
    EXPECT_GT(rms(w, 40 * 48, 240 * 48), 300.0) << "loop";
    EXPECT_TRUE(has(r.out, "played 22 of 22 events")) << r.out;
    EXPECT_TRUE(has(r.out, " 0 dropped")) << r.out;

    // Ctrl-C: the existing file stays as it was and the summary tells what was played.
    const std::string before = read_file(dir.file("cap.wav"));
    const RunResult c =
        run_kova({"play", "--gesture", "slow", "--device", kNoDevice, "--capture", "cap.wav"},
                 dir.path, 1000);
    EXPECT_TRUE(read_file(dir.file("cap.wav")) == before);
    EXPECT_EQ(count_files(dir.path), 2u) << "a temporary file was left behind";
    EXPECT_TRUE(has(c.out, "interrupted: played ") && !has(c.out, " 0 of ")) << c.out;
    EXPECT_TRUE(has(c.out, "cap.wav left as it was")) << c.out;
}

/* A device that never drains: ALSA's file plugin writing into a FIFO whose reader never reads.
 * The ring fills, later blocks are dropped and counted, and Ctrl-C ends the tool at once although
 * closing the stream blocks. */
TEST(KovaPlay, StalledDeviceDropsBlocksAndSignalEndsPromptly) {
    TempDir dir;
    const std::string fifo = dir.file("device.fifo");
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    const int reader = open(fifo.c_str(), O_RDONLY | O_NONBLOCK);
    ASSERT_GE(reader, 0);
    write_file(dir.file("alsa.conf"), "pcm.stall { type file slave.pcm { type null } file \"" +
                                          fifo + "\" format \"raw\" }\n");
    // 6 s of moves, far more than the ring and the device's buffers hold.
    write_file(dir.file("g.csv"), "time_ms,action,x,y\n" + stroke_csv(0, 6000, 100, true));
    const RunResult r = run_kova({"play", "--device", "stall", "--gesture", "g.csv"}, dir.path,
                                 5500, {"ALSA_CONFIG_PATH=" + dir.file("alsa.conf")});
    close(reader);
    EXPECT_EQ(r.code, 130) << r.err;
    EXPECT_LT(r.exit_ms, 1000);
    EXPECT_TRUE(has(r.out, "interrupted: played ")) << r.out;
    EXPECT_FALSE(has(r.out, " 0 dropped")) << r.out;
}

/* ALSA's "null" device takes samples and discards them; it exists wherever ALSA's configuration
 * is installed, so the ALSA sink's way (open, configure, write, drain) runs without a card. */
TEST(KovaPlay, PlaysThroughTheAlsaSinkOnTheNullDevice) {
    TempDir dir;
    const RunResult r = run_kova({"play", "--gesture", "fast", "--device", "null"}, dir.path);
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_TRUE(has(r.out, "playing on ALSA device null")) << r.out;
    EXPECT_TRUE(has(r.out, "38 blocks")) << "down, 36 moves and up all sounded: " << r.out;
}

}  // namespace
}  // namespace kova_test
