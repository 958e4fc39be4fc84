// SPDX-License-Identifier: Apache-2.0
#include <kova/android/kova_fasttrack.h>
#include <kova/kova_output.h>
#include <kova_host/audio_sink.h>
#include <pthread.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <memory>
#include <optional>
#include <thread>

#include "commands.h"
#include "gesture.h"
#include "output_file.h"
#include "sources.h"

namespace kova_tool {
namespace {

constexpr long kStatusPeriodMs = 100;
/* After the last event, the device plays out the stream's queue; waiting longer than the queue
 * can hold means the device stopped pulling. */
constexpr long kDrainSlackMs = 2000;
/* After SIGINT or SIGTERM the tool is gone within this, even when the device blocks the stream's
 * teardown: what is left then is left to the system. */
constexpr long kSignalGraceMs = 700;

struct PlayOptions {
    SetupOptions setup;
    GestureOptions gesture;
    std::string device = "default";
    std::optional<std::string> capture;
};

std::atomic<int> g_signal{0};

void on_signal(int sig) {
    g_signal.store(sig);
}

int64_t now_ms() {
    timespec t{};
    clock_gettime(CLOCK_MONOTONIC, &t);
    return static_cast<int64_t>(t.tv_sec) * 1000 + t.tv_nsec / 1000000;
}

void sleep_ms(int64_t ms) {
    if (ms <= 0) return;
    timespec t{static_cast<time_t>(ms / 1000), static_cast<long>(ms % 1000) * 1000000};
    nanosleep(&t, nullptr);
}

/* The stream, closed on every way out. */
struct StreamCloser {
    void operator()(KOVA_FASTTRACK* ft) const { kova_close_fasttrack(ft, 1); }
};
using Stream = std::unique_ptr<KOVA_FASTTRACK, StreamCloser>;

/* Bytes queued in the stream's ring buffer, read under the stream's own lock as its writer and
 * its callback do. */
uint32_t ring_fill(KOVA_FASTTRACK* ft) {
    if (ft->pMutex) pthread_mutex_lock(ft->pMutex);
    const uint32_t n = ft->pRing ? kova_ringbuffer_read_space(ft->pRing) : 0;
    if (ft->pMutex) pthread_mutex_unlock(ft->pMutex);
    return n;
}

/* What the run did so far; read by the watchdog thread too, hence atomics. */
struct Counts {
    std::atomic<size_t> events{0}, blocks{0}, dropped{0};
    std::atomic<uint64_t> bytes{0};
    std::atomic<unsigned long> underruns{0}; /* while a stroke is held, not in pauses */
    unsigned long stroke_base = 0;           /* the device's count when the stroke began */
    bool in_stroke = false;
    size_t total_events = 0;
    int64_t start_ms = 0;
    std::optional<std::string> capture;
    std::string capture_temp; /* removed if the watchdog ends the process */
    std::atomic<bool> reported{false};

    void stroke(bool begins) {
        if (in_stroke) underruns += kova_host_underruns() - stroke_base;
        stroke_base = kova_host_underruns();
        in_stroke = begins;
    }

    /* The summary line, printed once by whoever gets here first. */
    void report(int sig) {
        if (reported.exchange(true)) return;
        const double s = (now_ms() - start_ms) / 1000.0;
        std::fprintf(info(),
                     "%s %zu of %zu events in %.2f s: %zu blocks (%llu bytes), %zu dropped "
                     "(stream full), underruns during strokes %lu\n",
                     sig ? "interrupted: played" : "played", events.load(), total_events, s,
                     blocks.load(), static_cast<unsigned long long>(bytes.load()), dropped.load(),
                     underruns.load());
        if (sig && capture)
            std::fprintf(info(), "capture not written: %s left as it was\n", capture->c_str());
        std::fflush(info());
    }
};

/* The status line on a terminal, refreshed while the command waits:
 * "[#########-------]  1.20 / 3.18 s   ring  45 ms   dropped 0   underruns 0". */
struct Status {
    KOVA_FASTTRACK* ft;
    double bytes_per_ms;
    int64_t total_ms;
    const Counts& counts;
    bool tty = isatty(STDERR_FILENO) == 1 && !quiet();
    bool shown = false;

    void show(int64_t elapsed_ms) {
        if (!tty) return;
        constexpr int64_t kWidth = 24;
        const auto done = static_cast<size_t>(std::min(elapsed_ms, total_ms) * kWidth / total_ms);
        std::fprintf(stderr,
                     "\r  [%s%s] %6.2f / %.2f s   ring %4.0f ms   dropped %zu   underruns %lu ",
                     std::string(done, '#').c_str(), std::string(kWidth - done, '-').c_str(),
                     elapsed_ms / 1000.0, total_ms / 1000.0, ring_fill(ft) / bytes_per_ms,
                     counts.dropped.load(), counts.underruns.load());
        std::fflush(stderr);
        shown = true;
    }
    void finish() {
        if (shown) std::fputc('\n', stderr);
    }
};

/* Sleeps until `until` (monotonic ms), refreshing the status line on the way. */
void wait_until(int64_t until, int64_t start, Status& status) {
    for (;;) {
        const int64_t now = now_ms();
        if (now >= until || g_signal.load()) return;
        status.show(now - start);
        sleep_ms(std::min<int64_t>(until - now, kStatusPeriodMs));
    }
}

/* Leaves the process kSignalGraceMs after a signal if the command has not returned by then:
 * a device that never drains may block the stream's teardown. */
void start_watchdog(Counts& counts) {
    std::thread([&counts] {
        while (!g_signal.load()) sleep_ms(20);
        sleep_ms(kSignalGraceMs);
        counts.report(g_signal.load());
        if (!counts.capture_temp.empty()) unlink(counts.capture_temp.c_str());
        _exit(128 + g_signal.load());
    }).detach();
}

/* SIGINT and SIGTERM end the playback early (the loop and the drain look at g_signal). */
void catch_signals() {
    g_signal.store(0);
    struct sigaction sa {};
    sa.sa_handler = on_signal;
    sigaction(SIGINT, &sa, nullptr);
    sigaction(SIGTERM, &sa, nullptr);
}

/* Without a sound device only a capture can play; with --capture the target file is created
 * first, so a folder that cannot be written fails before any work. */
std::unique_ptr<OutputFile> open_capture(const PlayOptions& o, Counts& counts) {
    char why[256] = "";
    const bool has_device = kova_host_alsa_probe(o.device.c_str(), why, sizeof why) == 0;
    if (!o.capture) {
        if (!has_device) {
            failure("no sound device (ALSA " + in_quotes(o.device) + ": " + why +
                    "); use --capture FILE to write the stream to a WAV file");
        }
        return nullptr;
    }
    auto capture_file = std::make_unique<OutputFile>(*o.capture);
    counts.capture_temp = capture_file->temp_path();
    if (!has_device) std::fprintf(info(), "no sound device (ALSA %s: %s); ", o.device.c_str(), why);
    std::fprintf(info(), "capturing the stream to %s\n", o.capture->c_str());
    return capture_file;
}

/* The host stand-in's sink for the stream: the capture buffer, or the ALSA device. */
void choose_sink(const PlayOptions& o) {
    char why[256] = "";
    if (o.capture) {
        kova_host_use_capture_sink();
        kova_host_capture_clear();
    } else if (kova_host_use_alsa_sink(o.device.c_str(), why, sizeof why) != 0) {
        failure("no sound device (ALSA " + in_quotes(o.device) + ": " + why + ")");
    }
    kova_host_reset_counters();
}

/* Each event at its time: generated, then written whole to the stream or counted as dropped. */
void play_events(Engine& engine, KOVA_FASTTRACK* ft, const std::vector<TouchEvent>& events,
                 int64_t start, Status& status, Counts& counts) {
    const int64_t t0 = events.front().time_ms;
    std::vector<int16_t> block(kBlockBytes / 2);
    for (const TouchEvent& e : events) {
        wait_until(start + (e.time_ms - t0), start, status);
        if (g_signal.load()) break;
        if (e.action == KOVA_ACTION_START) counts.stroke(true);
        const int32_t bytes = generate_event(engine, e, block);
        if (bytes > 0) {
            // All or nothing: a block that does not fit the ring is refused and dropped.
            const uint32_t n =
                kova_write_fasttrack(ft, block.data(), kBlockBytes, static_cast<uint32_t>(bytes));
            if (n == static_cast<uint32_t>(bytes)) {
                ++counts.blocks;
                counts.bytes += n;
            } else {
                ++counts.dropped;
            }
        }
        ++counts.events;
        if (e.action == KOVA_ACTION_END) counts.stroke(false);
    }
}

/* Lets the device play out what is queued, and says what it never took. */
void drain(KOVA_FASTTRACK* ft, double bytes_per_ms, int64_t start, Status& status) {
    const int64_t drain_deadline =
        now_ms() + static_cast<int64_t>(ring_fill(ft) / bytes_per_ms) + kDrainSlackMs;
    while (!g_signal.load() && ring_fill(ft) > 0 && now_ms() < drain_deadline) {
        status.show(now_ms() - start);
        sleep_ms(10);
    }
    if (!g_signal.load()) sleep_ms(2 * kStatusPeriodMs);  // the device's own buffer
    if (const uint32_t left = ring_fill(ft); left > 0 && !g_signal.load())
        note("the device stopped taking sound; " +
             std::to_string(static_cast<int>(left / bytes_per_ms)) + " ms never played");
}

/* Writes the captured stream to the --capture target. */
void save_capture(OutputFile& capture_file, const std::string& target, const KOVA_FORMAT& fmt) {
    if (kova_host_capture_write_wav(capture_file.temp_path().c_str(),
                                    static_cast<int>(fmt.sample_rate),
                                    static_cast<int>(fmt.channels)) != 0) {
        failure("cannot write " + in_quotes(target) + ": the capture could not be saved");
    }
    capture_file.commit();
    std::fprintf(info(), "wrote %s: %.3f s captured\n", target.c_str(),
                 kova_host_capture_size() / (fmt.sample_rate * fmt.channels * 2.0));
}

int run_play(PlayOptions& o) {
    SetupOptions& setup = o.setup;
    finish_setup(setup);
    const KOVA_FORMAT fmt = setup.format.format();
    const std::vector<TouchEvent> events = load_gesture(o.gesture, fmt.w, fmt.h);

    static Counts counts; /* outlives this function: the watchdog may read it until the exit */
    counts.total_events = events.size();
    counts.capture = o.capture;
    counts.start_ms = now_ms();
    catch_signals();
    start_watchdog(counts);
    std::unique_ptr<OutputFile> capture_file = open_capture(o, counts);

    Engine engine(setup.format);
    prepare_set(engine, setup);
    choose_sink(o);
    Stream stream(
        kova_open_fasttrack(static_cast<int>(fmt.sample_rate), static_cast<int>(fmt.channels)));
    if (!stream) failure("the output stream could not be opened");
    KOVA_FASTTRACK* ft = stream.get();

    if (!o.capture) std::fprintf(info(), "playing on ALSA device %s\n", o.device.c_str());
    std::fflush(info());
    kova_start_fasttrack(ft);
    const int64_t t0 = events.front().time_ms;
    const double bytes_per_ms = fmt.sample_rate * fmt.channels * 2 / 1000.0;
    Status status{ft, bytes_per_ms, std::max<int64_t>(events.back().time_ms - t0, 1), counts};
    const int64_t start = counts.start_ms = now_ms();
    play_events(engine, ft, events, start, status, counts);
    drain(ft, bytes_per_ms, start, status);
    counts.stroke(false);
    status.show(now_ms() - start);
    status.finish();

    if (const int sig = g_signal.load()) {
        // An interrupted capture is incomplete: the target keeps what it held.
        capture_file.reset();
        counts.report(sig);
        return 128 + sig;  // the stream closes on the way out, bounded by the watchdog
    }
    kova_stop_fasttrack(ft);
    stream.reset();
    counts.report(0);
    if (capture_file) save_capture(*capture_file, *o.capture, fmt);
    return kExitOk;
}

}  // namespace

Run add_play(CLI::App& app) {
    auto o = std::make_shared<PlayOptions>();
    CLI::App* sub = app.add_subcommand(
        "play", "play a gesture live through the low-latency output stream (Ctrl-C: exit 130)");
    add_gesture_options(*sub, o->gesture);
    sub->add_option("--device", o->device, "ALSA playback device (default \"default\")")
        ->type_name("NAME")
        ->group("Output");
    sub->add_option_function<std::string>(
           "--capture", [o](const std::string& v) { o->capture = v; },
           "write the stream to a WAV file instead of the sound device (the blocks back to "
           "back; pauses where the stream had nothing are not in the file)")
        ->type_name("FILE")
        ->group("Output");
    add_setup_options(*sub, o->setup, true);
    return [o] { return run_play(*o); };
}

}  // namespace kova_tool
