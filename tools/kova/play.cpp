#include <kova/android/kova_fasttrack.h>
#include <kova/kova_output.h>
#include <kova_host/audio_sink.h>
#include <pthread.h>
#include <time.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <cstring>
#include <memory>
#include <optional>

#include "commands.h"
#include "gesture.h"
#include "output_file.h"
#include "sources.h"

namespace kova_tool {
namespace {

const char* const kHelp =
    "Usage: kova play [options]\n"
    "Plays a gesture live: each event is generated at its own time and written to the low-latency\n"
    "output stream, which plays it on the sound device (ALSA). Without a sound device, --capture\n"
    "still runs the stream in real time and writes what the device would have received (the\n"
    "blocks back to back; pauses where the stream had nothing are not in the file).\n"
    "A status line on a terminal shows the elapsed time, the stream's ring-buffer fill and the\n"
    "underruns counted while a stroke is held (bursts the device asked for and got short).\n"
    "\n"
    "Output:\n"
    "  --device NAME        ALSA playback device (default \"default\")\n"
    "  --capture FILE       write the stream to a WAV file instead of the sound device\n"
    "  --thickness X        equaliser thickness, 0..1 (default: the set's, 0.6)\n"
    "  --volume X           output volume, 0..1 (default 1)\n"
    "  -v, --verbose        also show the library's and the stream's diagnostic lines\n";

constexpr long kStatusPeriodMs = 100;
/* After the last event, the device plays out the stream's queue; waiting longer than the queue
 * can hold means the device stopped pulling. */
constexpr long kDrainSlackMs = 2000;

std::atomic<bool> g_interrupted{false};

void on_signal(int) {
    g_interrupted.store(true);
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

class Status {
   public:
    Status(KOVA_FASTTRACK* ft, const KOVA_FORMAT& f)
        : ft_(ft),
          bytes_per_ms_(f.sample_rate * f.channels * 2 / 1000.0),
          tty_(isatty(STDERR_FILENO) == 1) {}

    void stroke_begins() {
        in_stroke_ = true;
        base_ = kova_host_underruns();
    }
    void stroke_ends() {
        if (in_stroke_) underruns_ += kova_host_underruns() - base_;
        in_stroke_ = false;
    }
    unsigned long underruns() const {
        return underruns_ + (in_stroke_ ? kova_host_underruns() - base_ : 0);
    }

    void show(int64_t elapsed_ms) {
        if (!tty_) return;
        const uint32_t fill = ring_fill(ft_);
        const uint32_t capacity = ft_->pRing ? ft_->pRing->size - 1 : 1;
        std::fprintf(stderr, "\r  %6.2f s   ring %5.1f%% (%4.0f ms)   underruns %lu   ",
                     elapsed_ms / 1000.0, 100.0 * fill / capacity, fill / bytes_per_ms_,
                     underruns());
        std::fflush(stderr);
        shown_ = true;
    }
    void finish() {
        if (shown_) std::fputc('\n', stderr);
        shown_ = false;
    }

   private:
    KOVA_FASTTRACK* ft_;
    double bytes_per_ms_;
    bool tty_;
    bool shown_ = false;
    bool in_stroke_ = false;
    unsigned long base_ = 0;
    unsigned long underruns_ = 0;
};

/* Sleeps until `until` (monotonic ms), refreshing the status line on the way. */
void wait_until(int64_t until, int64_t start, Status& status) {
    for (;;) {
        const int64_t now = now_ms();
        if (now >= until || g_interrupted.load()) return;
        status.show(now - start);
        sleep_ms(std::min<int64_t>(until - now, kStatusPeriodMs));
    }
}

}  // namespace

int run_play(Args& args) {
    SetupOptions setup;
    GestureOptions gesture;
    std::string device = "default";
    std::optional<std::string> capture;
    const auto own = [&](const std::string& name) {
        if (name == "--device") {
            device = args.value(name);
        } else if (name == "--capture") {
            capture = args.value(name);
        } else {
            return false;
        }
        return true;
    };
    if (!read_gesture_command(args, "play", kHelp, setup, gesture, own)) return kExitOk;

    const KOVA_FORMAT fmt = setup.format.format();
    const std::vector<TouchEvent> events = load_gesture(gesture, fmt.w, fmt.h);

    char why[256] = "";
    const bool has_device = kova_host_alsa_probe(device.c_str(), why, sizeof why) == 0;
    std::unique_ptr<OutputFile> capture_file;
    if (capture) {
        capture_file = std::make_unique<OutputFile>(*capture);
        if (!has_device) {
            std::fprintf(out(), "no sound device (ALSA %s: %s); capturing the stream to %s\n",
                         device.c_str(), why, capture->c_str());
        } else {
            std::fprintf(out(), "capturing the stream to %s (the sound device is not used)\n",
                         capture->c_str());
        }
    } else if (!has_device) {
        failure("no sound device (ALSA " + quoted(device) + ": " + why +
                "); use --capture FILE to write the stream to a WAV file");
    }

    Engine engine(setup.format);
    prepare_set(engine, setup);

    if (capture) {
        kova_host_use_capture_sink();
        kova_host_capture_clear();
    } else if (kova_host_use_alsa_sink(device.c_str(), why, sizeof why) != 0) {
        failure("no sound device (ALSA " + quoted(device) + ": " + why + ")");
    }
    kova_host_reset_counters();

    Stream stream(
        kova_open_fasttrack(static_cast<int>(fmt.sample_rate), static_cast<int>(fmt.channels)));
    if (!stream) failure("the output stream could not be opened");
    KOVA_FASTTRACK* ft = stream.get();

    g_interrupted.store(false);
    struct sigaction sa {};
    sa.sa_handler = on_signal;
    sigaction(SIGINT, &sa, nullptr);
    sigaction(SIGTERM, &sa, nullptr);

    if (!capture) std::fprintf(out(), "playing on ALSA device %s\n", device.c_str());
    std::fflush(out());
    kova_start_fasttrack(ft);
    Status status(ft, fmt);
    std::vector<int16_t> block(kBlockBytes / 2);
    size_t blocks = 0, dropped = 0;
    uint64_t bytes_written = 0;
    const int64_t start = now_ms();
    const int64_t t0 = events.front().time_ms;
    for (const TouchEvent& e : events) {
        wait_until(start + (e.time_ms - t0), start, status);
        if (g_interrupted.load()) break;
        if (e.action == KOVA_ACTION_START) status.stroke_begins();
        const int32_t bytes = generate_event(engine, e, block);
        if (bytes > 0) {
            const uint32_t n =
                kova_write_fasttrack(ft, block.data(), kBlockBytes, static_cast<uint32_t>(bytes));
            if (n == static_cast<uint32_t>(bytes)) {
                ++blocks;
                bytes_written += n;
            } else {
                ++dropped;  // the ring buffer was full: the stream drops a block that does not fit
            }
        }
        if (e.action == KOVA_ACTION_END) status.stroke_ends();
    }
    // Let the device play out what is queued.
    const int64_t drain_deadline =
        now_ms() +
        static_cast<int64_t>(ring_fill(ft) / (fmt.sample_rate * fmt.channels * 2 / 1000.0)) +
        kDrainSlackMs;
    while (!g_interrupted.load() && ring_fill(ft) > 0 && now_ms() < drain_deadline) {
        status.show(now_ms() - start);
        sleep_ms(10);
    }
    sleep_ms(2 * kStatusPeriodMs);  // the device's own buffer
    status.stroke_ends();
    status.show(now_ms() - start);
    status.finish();
    kova_stop_fasttrack(ft);
    stream.reset();
    signal(SIGINT, SIG_DFL);
    signal(SIGTERM, SIG_DFL);

    const double seconds = (now_ms() - start) / 1000.0;
    std::fprintf(out(),
                 "played %zu events in %.2f s: %zu blocks (%llu bytes), %zu dropped (stream full), "
                 "underruns during strokes %lu\n",
                 events.size(), seconds, blocks, static_cast<unsigned long long>(bytes_written),
                 dropped, status.underruns());
    if (capture_file) {
        if (kova_host_capture_write_wav(capture_file->temp_path().c_str(),
                                        static_cast<int>(fmt.sample_rate),
                                        static_cast<int>(fmt.channels)) != 0) {
            failure("cannot write " + quoted(*capture) + ": the capture could not be saved");
        }
        capture_file->commit();
        std::fprintf(out(), "wrote %s: %.3f s captured\n", capture->c_str(),
                     kova_host_capture_size() / (fmt.sample_rate * fmt.channels * 2.0));
    }
    if (g_interrupted.load()) failure("interrupted");
    return kExitOk;
}

}  // namespace kova_tool
