// Queueing PCM between the generator and the output callback: the library's ring buffer against
// JACK's lock-free ring buffer and against copying the same bytes in and out with memcpy alone;
// and the ring buffer as it runs in the output stream, each write and each pull under the
// stream's mutex (kova_write_fasttrack and the device callback).
#include <jack/ringbuffer.h>

#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "bench_registry.h"
#include "kova/android/kova_fasttrack.h"
#include "kova/kova_output.h"
#include "kova_host/audio_sink.h"
#include "media/AudioTrack.h"
#include "summary.h"

namespace kova_bench {
namespace {

// The output stream asks for 384000 bytes; both ring buffers round that up to 524288.
constexpr uint32_t kRingRequest = 384000;

// One round: one write of `block` bytes, then reads of `pull` bytes until it is drained.
struct Pattern {
    const char* label;
    uint32_t block;
    uint32_t pull;
};
constexpr Pattern kPatterns[] = {
    {"w3840_r3840", 3840, 3840},  // whole blocks in and out
    {"w3840_r768", 3840, 768},    // generator blocks, drained by the callback's 768-byte pulls
    {"w768_r768", 768, 768},      // per-call overhead at the callback's size
};

std::string name_of(const char* impl, const Pattern& p) {
    return std::string("queue/") + impl + "/" + p.label;
}

struct Buffers {
    std::vector<uint8_t> src, dst;
    explicit Buffers(const Pattern& p) : src(p.block), dst(p.block) {
        for (uint32_t i = 0; i < p.block; ++i) src[i] = static_cast<uint8_t>(i * 7 + 1);
    }
};

void finish(benchmark::State& state, const Pattern& p) {
    state.SetBytesProcessed(state.iterations() * p.block);
}

void bm_kova(benchmark::State& state, Pattern p) {
    Buffers b(p);
    KOVA_RINGBUFFER* rb = kova_ringbuffer_create(kRingRequest);
    uint64_t moved = 0;
    for (auto _ : state) {
        moved += kova_ringbuffer_write(rb, b.src.data(), p.block);
        for (uint32_t done = 0; done < p.block; done += p.pull) {
            moved += kova_ringbuffer_read(rb, b.dst.data() + done, p.pull);
        }
        benchmark::ClobberMemory();
    }
    benchmark::DoNotOptimize(moved);
    if (moved != 2 * p.block * static_cast<uint64_t>(state.iterations())) {
        state.SkipWithError("ring buffer moved fewer bytes than asked");
    }
    kova_ringbuffer_free(rb);
    finish(state, p);
}

void bm_jack(benchmark::State& state, Pattern p) {
    Buffers b(p);
    jack_ringbuffer_t* rb = jack_ringbuffer_create(kRingRequest);
    uint64_t moved = 0;
    for (auto _ : state) {
        moved += jack_ringbuffer_write(rb, reinterpret_cast<const char*>(b.src.data()), p.block);
        for (uint32_t done = 0; done < p.block; done += p.pull) {
            moved += jack_ringbuffer_read(rb, reinterpret_cast<char*>(b.dst.data() + done), p.pull);
        }
        benchmark::ClobberMemory();
    }
    benchmark::DoNotOptimize(moved);
    if (moved != 2 * p.block * static_cast<uint64_t>(state.iterations())) {
        state.SkipWithError("JACK ring buffer moved fewer bytes than asked");
    }
    jack_ringbuffer_free(rb);
    finish(state, p);
}

// The stream's own path: kova_write_fasttrack, then the callback's pulls, each taking the
// stream mutex. The stand-in device is held so that only these calls drain the ring.
void bm_stream(benchmark::State& state, Pattern p) {
    Buffers b(p);
    KOVA_FASTTRACK* ft = kova_open_fasttrack(48000, 2);
    if (ft == nullptr) {
        state.SkipWithError("stream did not open");
        return;
    }
    kova_host_hold_device(1);
    kova_start_fasttrack(ft);
    uint64_t moved = 0;
    for (auto _ : state) {
        moved += kova_write_fasttrack(ft, b.src.data(), p.block, p.block);
        for (uint32_t done = 0; done < p.block; done += p.pull) {
            android::AudioTrack::Buffer buf{};
            buf.frameCount = p.pull / 4;
            buf.size = p.pull;
            buf.raw = b.dst.data() + done;
            FastTrackCallback(android::AudioTrack::EVENT_MORE_DATA, ft, &buf);
            moved += buf.size;
        }
        benchmark::ClobberMemory();
    }
    kova_close_fasttrack(ft, 0);
    kova_host_hold_device(0);
    benchmark::DoNotOptimize(moved);
    if (moved != 2 * p.block * static_cast<uint64_t>(state.iterations())) {
        state.SkipWithError("stream moved fewer bytes than asked");
    }
    finish(state, p);
}

// The floor: the same bytes copied into a store of the ring's size and out again, at advancing
// offsets (restarting at 0 instead of splitting at the end), with no bookkeeping.
void bm_memcpy(benchmark::State& state, Pattern p) {
    Buffers b(p);
    std::vector<uint8_t> store(524288);
    uint32_t w = 0, r = 0;
    for (auto _ : state) {
        if (w + p.block > store.size()) w = 0;
        std::memcpy(store.data() + w, b.src.data(), p.block);
        w += p.block;
        for (uint32_t done = 0; done < p.block; done += p.pull) {
            if (r + p.pull > store.size()) r = 0;
            std::memcpy(b.dst.data() + done, store.data() + r, p.pull);
            r += p.pull;
        }
        benchmark::DoNotOptimize(b.dst.data());
        benchmark::ClobberMemory();
    }
    finish(state, p);
}

int summary(const Results& r, std::ostream& out) {
    int missed = 0;
    out << "\n### Queueing: one write and the reads that drain it (CPU time per round)\n\n"
        << "| pattern | library ns | under the stream mutex ns | JACK ns | memcpy ns "
        << "| library / memcpy (target <= 1.3x) | JACK / library | JACK / under the mutex |\n"
        << "|---|---|---|---|---|---|---|---|\n";
    for (const Pattern& p : kPatterns) {
        const Measured* k = find(r, name_of("kova", p));
        const Measured* j = find(r, name_of("jack", p));
        const Measured* st = find(r, name_of("stream", p));
        const Measured* m = find(r, name_of("memcpy", p));
        if (!k) continue;
        out << "| " << p.block << " B in, " << p.block / p.pull << " x " << p.pull << " B out | "
            << fixed(k->cpu_ns, 1) << " | " << (st ? fixed(st->cpu_ns, 1) : "-") << " | "
            << (j ? fixed(j->cpu_ns, 1) : "-") << " | " << (m ? fixed(m->cpu_ns, 1) : "-") << " | ";
        if (m) {
            const double f = k->cpu_ns / m->cpu_ns;
            missed += f > 1.3;
            out << fixed(f, 2) << "x " << verdict(f <= 1.3);
        }
        out << " | " << (j ? fixed(j->cpu_ns / k->cpu_ns, 2) + "x" : "-") << " | "
            << (j && st ? fixed(j->cpu_ns / st->cpu_ns, 2) + "x" : "-") << " |\n";
    }
    return missed;
}

}  // namespace

void register_ringbuffer_benchmarks() {
    for (const Pattern& p : kPatterns) {
        benchmark::RegisterBenchmark(name_of("kova", p).c_str(), bm_kova, p);
        benchmark::RegisterBenchmark(name_of("jack", p).c_str(), bm_jack, p);
        benchmark::RegisterBenchmark(name_of("stream", p).c_str(), bm_stream, p);
        benchmark::RegisterBenchmark(name_of("memcpy", p).c_str(), bm_memcpy, p);
    }
    add_section(20, summary);
}

}  // namespace kova_bench
