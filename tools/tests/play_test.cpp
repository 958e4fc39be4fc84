/* kova play on a machine without the named sound device: it says so, and --capture still runs the
 * stream in real time and writes what the device would have received. */
#include <gtest/gtest.h>

#include <sstream>

#include "support/tool_run.h"

namespace kova_test {
namespace {

/* An ALSA device name that exists nowhere, so the tests behave the same with or without a card. */
const std::string kNoDevice = "kova-test-no-such-device";

TEST(KovaPlay, CaptureHoldsEveryBlockWithoutADevice) {
    TempDir dir;
    // Down, 20 moves of 10 ms at 1 px/ms, up: 80 ms + 200 ms + 120 ms of blocks.
    std::ostringstream g;
    g << "time_ms,action,x,y\n0,down,100,100\n";
    for (int t = 10; t <= 200; t += 10) g << t << ",move," << 100 + t << ",100\n";
    g << "210,up,300,100\n";
    write_file(dir.file("g.csv"), g.str());
    const RunResult r = run_kova(
        {"play", "--gesture", "g.csv", "--device", kNoDevice, "--capture", "cap.wav"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_NE(r.out.find("no sound device"), std::string::npos) << r.out;
    EXPECT_NE(r.out.find(kNoDevice), std::string::npos) << r.out;
    const Wav w = read_wav(dir.file("cap.wav"));
    EXPECT_EQ(w.rate, 48000);
    EXPECT_EQ(w.channels, 2);
    EXPECT_EQ(w.frames(), static_cast<size_t>((80 + 200 + 120) * 48));
    EXPECT_GT(rms(w, 0, 80 * 48), 300.0) << "start sound";
    EXPECT_GT(rms(w, 80 * 48, 280 * 48), 300.0) << "loop";
}

TEST(KovaPlay, WithoutDeviceOrCaptureFailsClearly) {
    TempDir dir;
    const RunResult r = run_kova({"play", "--gesture", "fast", "--device", kNoDevice}, dir.path());
    EXPECT_EQ(r.code, 1);
    EXPECT_EQ(count_lines(r.err), 1) << r.err;
    EXPECT_NE(r.err.find("no sound device"), std::string::npos) << r.err;
    EXPECT_NE(r.err.find("--capture"), std::string::npos) << r.err;
}

/* ALSA's "null" device takes samples and discards them; it exists wherever ALSA's configuration
 * is installed, so the ALSA sink's way (open, configure, write, drain) runs without a card. */
TEST(KovaPlay, PlaysThroughTheAlsaSinkOnTheNullDevice) {
    TempDir dir;
    const RunResult r = run_kova({"play", "--gesture", "fast", "--device", "null"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_NE(r.out.find("playing on ALSA device null"), std::string::npos) << r.out;
    EXPECT_NE(r.out.find("38 blocks"), std::string::npos)
        << "down, 36 moves and up all sounded: " << r.out;
}

}  // namespace
}  // namespace kova_test
