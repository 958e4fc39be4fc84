/* kova render: the WAV file read back with libsndfile, the PNG read back with cairo. */
#include <cairo.h>
#include <sndfile.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <map>
#include <set>
#include <sstream>

#include "support/tool_run.h"

namespace kova_test {
namespace {

/* Lengths of the built-in start and end sounds, as documented. */
constexpr int kStartMs = 40;
constexpr int kEndMs = 120;

/* Two strokes of 1 px/ms with a pause: down at 0, a move every 10 ms to 500, up at 510; down
 * again at 1500, moves to 1800, up at 1810. */
std::string two_strokes_csv() {
    std::ostringstream s;
    s << "time_ms,action,x,y,aux\n# two strokes\n0,down,100,100\n";
    for (int t = 10; t <= 500; t += 10) s << t << ",move," << 100 + t << ",100\n";
    s << "510,up,600,100\n\n1500,down,100,500,0.5\n";
    for (int t = 1510; t <= 1800; t += 10) s << t << ",move," << 100 + (t - 1500) << ",500\n";
    s << "1810,up,400,500\n";
    return s.str();
}

struct Format {
    int rate;
    int channels;
    friend void PrintTo(const Format& f, std::ostream* os) {
        *os << f.rate << " Hz, " << f.channels << " ch";
    }
};

class KovaRender : public ::testing::TestWithParam<Format> {};

/* Blocks queue back to back within a stroke; the pause is silent and the second stroke starts
 * at its own time. */
TEST_P(KovaRender, PlacesBlocksByTimeWithSilentPauses) {
    const Format f = GetParam();
    TempDir dir;
    write_file(dir.file("g.csv"), two_strokes_csv());
    const RunResult r = run_kova({"render", "--gesture", "g.csv", "--rate", std::to_string(f.rate),
                                  "--channels", std::to_string(f.channels), "-o", "g.wav"},
                                 dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    const Wav w = read_wav(dir.file("g.wav"));
    EXPECT_EQ(w.rate, f.rate);
    EXPECT_EQ(w.channels, f.channels);

    auto frames = [&](size_t ms) { return static_cast<size_t>(f.rate) * ms / 1000; };
    const size_t start = frames(kStartMs), end = frames(kEndMs);
    const size_t loop1 = 50 * frames(10), loop2 = 30 * frames(10);
    const size_t stroke1_end = start + loop1 + end;
    const size_t stroke2 = frames(1500);
    ASSERT_EQ(w.frames(), stroke2 + start + loop2 + end);

    EXPECT_GT(rms(w, 0, start), 300.0) << "start sound";
    EXPECT_GT(rms(w, start, start + loop1), 300.0) << "loop while moving";
    EXPECT_GT(rms(w, start + loop1, stroke1_end), 100.0) << "end sound";
    EXPECT_EQ(peak(w, stroke1_end, stroke2), 0) << "the pause between strokes";
    EXPECT_GT(rms(w, stroke2, stroke2 + start), 300.0) << "second start sound";
    EXPECT_GT(rms(w, stroke2 + start, stroke2 + start + loop2), 300.0) << "second loop";
}

INSTANTIATE_TEST_SUITE_P(Formats, KovaRender,
                         ::testing::Values(Format{48000, 2}, Format{16000, 1}, Format{44100, 2}),
                         [](const auto& info) {
                             return std::to_string(info.param.rate) + "Hz" +
                                    std::to_string(info.param.channels) + "ch";
                         });

/* The default gesture's length follows from its events: each stroke is its start sound, one
 * block per move as long as the time since the event before, and its end sound, and a stroke
 * whose down event comes after the previous stroke has played starts at its own time. */
TEST(KovaRenderDefaults, LengthFollowsTheBuiltInGesture) {
    TempDir dir;
    RunResult r = run_kova({"gesture", "strokes", "-o", "strokes.csv"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    r = run_kova({"render", "-o", "stroke.wav"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    EXPECT_NE(r.out.find("stroke.wav"), std::string::npos);
    const Wav w = read_wav(dir.file("stroke.wav"));
    EXPECT_EQ(w.rate, 48000);
    EXPECT_EQ(w.channels, 2);

    std::istringstream csv(read_file(dir.file("strokes.csv")));
    std::string line;
    std::getline(csv, line);
    size_t cursor = 0;
    long long t0 = -1, prev = 0;
    int strokes = 0;
    std::vector<size_t> pauses;
    while (std::getline(csv, line)) {
        std::istringstream cells(line);
        std::string t, action;
        std::getline(cells, t, ',');
        std::getline(cells, action, ',');
        const long long ms = std::stoll(t);
        if (t0 < 0) t0 = ms;
        if (action == "down") {
            const size_t due = static_cast<size_t>(ms - t0) * 48;
            if (due > cursor) pauses.push_back(cursor), cursor = due;
            cursor += kStartMs * 48;
            ++strokes;
        } else if (action == "move") {
            cursor += static_cast<size_t>(ms - prev) * 48;
        } else {
            cursor += kEndMs * 48;
        }
        prev = ms;
    }
    EXPECT_EQ(strokes, 3);
    EXPECT_EQ(w.frames(), cursor);
    // Loud enough to hear next to other sounds, with headroom: a peak of -6 to -1 dBFS.
    EXPECT_GE(peak(w, 0, w.frames()), 16423);
    EXPECT_LE(peak(w, 0, w.frames()), 29205);
    ASSERT_EQ(pauses.size(), 2u);
    for (size_t p = 0; p < pauses.size(); ++p) {
        EXPECT_EQ(peak(w, pauses[p], pauses[p] + 4800), 0) << "pause " << p;
    }
}

/* Frequency of channel 0 over the first moves of the first stroke, by zero crossings. */
double loop_hz(const Wav& w) {
    const size_t last = 50 * 480;
    int crossings = 0;
    for (size_t i = 1; i < std::min(last, w.frames()); ++i) {
        const int a = w.samples[(i - 1) * w.channels], b = w.samples[i * w.channels];
        if ((a < 0) != (b < 0)) ++crossings;
    }
    return crossings / 2.0 / (last / 48000.0);
}

/* Loops from sound files: raw PCM as it is, a WAV in the engine's format exactly as its samples,
 * and other formats converted (rate, channels, sample type) so the tone keeps its pitch. */
TEST(KovaRenderFiles, SoundFilesKeepTheirSamplesOrTheirPitch) {
    TempDir dir;
    write_file(dir.file("g.csv"), two_strokes_csv());
    write_tone(dir.file("tone.wav"), SF_FORMAT_WAV | SF_FORMAT_PCM_16, 48000, 2, 1.0);
    write_tone(dir.file("tone.flac"), SF_FORMAT_FLAC | SF_FORMAT_PCM_24, 44100, 1, 1.0);
    write_tone(dir.file("tone.ogg"), SF_FORMAT_OGG | SF_FORMAT_VORBIS, 22050, 2, 1.0);
    const Wav wav = read_wav(dir.file("tone.wav"));
    write_file(dir.file("tone.raw"), std::string(reinterpret_cast<const char*>(wav.samples.data()),
                                                 wav.samples.size() * 2));
    std::map<std::string, std::string> rendered;
    for (const char* loop : {"tone.raw", "tone.wav", "tone.flac", "tone.ogg"}) {
        SCOPED_TRACE(loop);
        const std::string out = std::string(loop) + ".out.wav";
        const RunResult r =
            run_kova({"render", "--loop", loop, "--gesture", "g.csv", "-o", out}, dir.path());
        ASSERT_EQ(r.code, 0) << r.err;
        const bool converted = std::string(loop).find(".wav") == std::string::npos &&
                               std::string(loop).find(".raw") == std::string::npos;
        EXPECT_EQ(r.err.find("kova: note: converted loop sound") != std::string::npos, converted)
            << r.err;
        EXPECT_NEAR(loop_hz(read_wav(dir.file(out))), 440.0, 440.0 * 0.03);
        rendered[loop] = read_file(dir.file(out));
    }
    EXPECT_EQ(rendered["tone.wav"], rendered["tone.raw"]);
}

TEST(KovaRenderPicture, PngHasTheRequestedSizeAndShowsTheSound) {
    TempDir dir;
    RunResult r = run_kova(
        {"render", "--gesture", "fast", "-o", "f.wav", "--png", "f.png", "--png-size", "800x500"},
        dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    cairo_surface_t* s = cairo_image_surface_create_from_png(dir.file("f.png").c_str());
    ASSERT_EQ(cairo_surface_status(s), CAIRO_STATUS_SUCCESS);
    EXPECT_EQ(cairo_image_surface_get_width(s), 800);
    EXPECT_EQ(cairo_image_surface_get_height(s), 500);
    // A drawn waveform and spectrogram take many colours; a blank picture takes a handful.
    std::set<uint32_t> colours;
    const unsigned char* data = cairo_image_surface_get_data(s);
    const int stride = cairo_image_surface_get_stride(s);
    for (int y = 0; y < 500; y += 2) {
        for (int x = 0; x < 800; x += 2)
            colours.insert(reinterpret_cast<const uint32_t*>(data + y * stride)[x] & 0xFFFFFF);
    }
    EXPECT_GT(colours.size(), 200u);
    cairo_surface_destroy(s);

    r = run_kova({"render", "--gesture", "slow", "-o", "s.wav", "--png", "s.png"}, dir.path());
    ASSERT_EQ(r.code, 0) << r.err;
    s = cairo_image_surface_create_from_png(dir.file("s.png").c_str());
    ASSERT_EQ(cairo_surface_status(s), CAIRO_STATUS_SUCCESS);
    EXPECT_EQ(cairo_image_surface_get_width(s), 1200);
    EXPECT_EQ(cairo_image_surface_get_height(s), 720);
    cairo_surface_destroy(s);
}

}  // namespace
}  // namespace kova_test
