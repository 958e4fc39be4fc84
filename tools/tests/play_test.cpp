// SPDX-License-Identifier: Apache-2.0
/* kova play on a machine without the named sound device: it says so, and --capture still runs the
 * stream in real time and writes what the device would have received. */
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include "support/tool_run.h"

namespace kova_test {
namespace {

/* An ALSA device name that exists nowhere, so the tests behave the same with or without a card. */
const std::string kNoDevice = "kova-test-no-such-device";

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
    EXPECT_TRUE(has(r.out, kNoDevice)) << r.out;
    const Wav w = read_wav(dir.file("cap.wav"));
    EXPECT_EQ(w.rate, 48000);
    EXPECT_EQ(w.channels, 2);
    EXPECT_EQ(w.frames(), static_cast<size_t>((40 + 200 + 120) * 48));
    EXPECT_GT(rms(w, 0, 40 * 48), 300.0) << "start sound";
    EXPECT_GT(rms(w, 40 * 48, 240 * 48), 300.0) << "loop";
    EXPECT_TRUE(has(r.out, "played 22 of 22 events")) << r.out;
    EXPECT_TRUE(has(r.out, " 0 dropped")) << r.out;

    // Ctrl-C: the existing file stays as it was, the summary tells what was played, exit 130.
    const std::string before = read_file(dir.file("cap.wav"));
    const RunResult c =
        run_kova({"play", "--gesture", "slow", "--device", kNoDevice, "--capture", "cap.wav"},
                 dir.path, 1000);
    EXPECT_EQ(c.code, 130) << c.err;
    EXPECT_TRUE(read_file(dir.file("cap.wav")) == before);
    EXPECT_EQ(count_files(dir.path), 2u) << "a temporary file was left behind";
    EXPECT_TRUE(has(c.out, "interrupted: played ")) << c.out;
    EXPECT_FALSE(has(c.out, " 0 of ")) << "events before the signal played";
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
