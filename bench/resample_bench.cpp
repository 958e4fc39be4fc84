// Resampling one generation block: the library's stereo resampler against what a caller holding
// 16-bit PCM would otherwise use: libsamplerate's linear converter (with its 16-bit <-> float
// conversions, and without them) and the speexdsp resampler at quality 0 on interleaved 16-bit
// samples and through its float interface. The peers keep their state from block to block;
// the library's resampler starts each block afresh (its interface has no state), and speexdsp
// filters with a windowed sinc, a higher quality than linear interpolation.
#include <samplerate.h>
#include <speex/speex_resampler.h>

#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string>
#include <vector>

#include "bench_registry.h"
#include "bench_signal.h"
#include "kova/kova_dsp.h"
#include "summary.h"

namespace kova_bench {
namespace {

constexpr int32_t kRate = 48000;
constexpr int32_t kMoveSamples = 1536;  // a 16 ms move at 48000 Hz stereo

// Pitch-raise ratios the generator produces (it caps them at 6.9). 1.26... is the ratio of a
// 16 ms move at 3.125 px/ms with sharpness 0.2, which stages 1935 samples.
struct RatioCase {
    const char* label;
    double ratio;
};
constexpr RatioCase kRatios[] = {
    {"1.05", 1.05}, {"1.26", 1.2603260908356826}, {"2.0", 2.0}, {"4.0", 4.0}, {"6.9", 6.9}};

// The block the generator hands to the resampler for one move at this ratio.
struct Block {
    int32_t out_rate;    // 2 * trunc(48000 / ratio * 0.5), as the generator forms it
    int32_t in_samples;  // trunc(ratio * 1536), whole frames only
    std::vector<int16_t> input;
};

Block make_block(double ratio) {
    Block b;
    b.out_rate = 2 * static_cast<int32_t>((kRate / ratio) * 0.5);
    b.in_samples = static_cast<int32_t>(ratio * kMoveSamples) & ~1;
    b.input = noise_pcm(static_cast<std::size_t>(b.in_samples), 7);
    return b;
}

// Straightforward rendering of the resampler's arithmetic, used to show that the library's
// output is bit-identical: rounded 4.28 step, copy at exactly 1.0, floor interpolation in 64
// bits, snap within 128/2^28 of a whole frame.
std::vector<int16_t> reference_resample(int32_t num, int32_t den, const std::vector<int16_t>& in) {
    const int64_t step = ((static_cast<int64_t>(num) << 29) / den + 1) / 2;
    if (step == (int64_t{1} << 28)) return in;
    const int64_t frames = static_cast<int64_t>(in.size()) / 2;
    std::vector<int16_t> out;
    if (frames < 2) return out;
    int64_t f = 0, p = 0;
    do {
        const int64_t l0 = in[2 * f], r0 = in[2 * f + 1];
        if (p == 0) {
            out.push_back(static_cast<int16_t>(l0));
            out.push_back(static_cast<int16_t>(r0));
        } else {
            const int64_t l1 = in[2 * f + 2], r1 = in[2 * f + 3];
            out.push_back(static_cast<int16_t>(l0 + ((l1 - l0) * p >> 28)));
            out.push_back(static_cast<int16_t>(r0 + ((r1 - r0) * p >> 28)));
        }
        p += step;
        const int64_t frac = p & 0x0FFFFFFF;
        if (frac < 0x80) p -= frac;
        if (frac >= 0x0FFFFF80) p += 0x10000000 - frac;
        f += p >> 28;
        p &= 0x0FFFFFFF;
    } while (f < frames - 1);
    return out;
}

void check_against_reference() {
    int bad = 0;
    for (const RatioCase& rc : kRatios) {
        const Block b = make_block(rc.ratio);
        std::vector<int16_t> out(b.input.size() + 64);
        const KOVA_PCMBUF in{const_cast<int16_t*>(b.input.data()),
                             static_cast<int32_t>(b.input.size() * 2)};
        KOVA_PCMBUF res{out.data(), 0};
        kova_resample_s16_stereo(kRate, b.out_rate, &in, &res);
        const std::vector<int16_t> want = reference_resample(kRate, b.out_rate, b.input);
        const bool same = res.size == static_cast<int32_t>(want.size() * 2) &&
                          std::memcmp(out.data(), want.data(), want.size() * 2) == 0;
        if (!same) ++bad;
        preamble() << "- resampler, ratio " << rc.label << " (" << b.in_samples << " samples in, "
                   << res.size / 2 << " out): " << (same ? "identical to" : "DIFFERS FROM")
                   << " the reference arithmetic\n";
    }
    if (bad) preamble() << "- **resampler output check failed for " << bad << " ratio(s)**\n";
}

std::string name_of(const char* impl, const RatioCase& rc) {
    return std::string("resample/") + impl + "/ratio:" + rc.label;
}

void set_counters(benchmark::State& state, const Block& b) {
    state.SetItemsProcessed(state.iterations() * (b.in_samples / 2));  // input frames
    state.counters["in_samples"] = b.in_samples;
}

void bm_kova(benchmark::State& state, double ratio) {
    const Block b = make_block(ratio);
    std::vector<int16_t> out(b.input.size() + 64);
    const KOVA_PCMBUF in{const_cast<int16_t*>(b.input.data()),
                         static_cast<int32_t>(b.input.size() * 2)};
    int32_t produced = 0;
    for (auto _ : state) {
        KOVA_PCMBUF res{out.data(), 0};
        kova_resample_s16_stereo(kRate, b.out_rate, &in, &res);
        benchmark::DoNotOptimize(res.size);
        benchmark::ClobberMemory();
        produced = res.size / 2;
    }
    set_counters(state, b);
    state.counters["out_samples"] = produced;
}

// libsamplerate as a 16-bit caller uses it: convert in, convert the result back; with `helpers`
// false, the converter alone on float data converted beforehand (the conversions take a large
// part of the time). One converter state for the whole run, fed block after block, which is the
// converter's cheapest use.
void bm_src_linear(benchmark::State& state, double ratio, bool helpers) {
    const Block b = make_block(ratio);
    const long frames = b.in_samples / 2;
    std::vector<float> fin(b.input.size());
    std::vector<float> fout(b.input.size() * 2 + 256);
    std::vector<int16_t> out(fout.size());
    int err = 0;
    SRC_STATE* src = src_new(SRC_LINEAR, 2, &err);
    if (src == nullptr) {
        state.SkipWithError(src_strerror(err));
        return;
    }
    long produced = 0;
    src_short_to_float_array(b.input.data(), fin.data(), static_cast<int>(b.input.size()));
    for (auto _ : state) {
        if (helpers) {
            src_short_to_float_array(b.input.data(), fin.data(), static_cast<int>(b.input.size()));
        }
        SRC_DATA d{};
        d.data_in = fin.data();
        d.data_out = fout.data();
        d.input_frames = frames;
        d.output_frames = static_cast<long>(fout.size() / 2);
        d.src_ratio = static_cast<double>(b.out_rate) / kRate;
        d.end_of_input = 0;
        src_process(src, &d);
        if (helpers) {
            src_float_to_short_array(fout.data(), out.data(),
                                     static_cast<int>(d.output_frames_gen * 2));
        }
        benchmark::DoNotOptimize(out.data());
        benchmark::DoNotOptimize(fout.data());
        benchmark::ClobberMemory();
        produced = d.output_frames_gen * 2;
    }
    src_delete(src);
    set_counters(state, b);
    state.counters["out_samples"] = static_cast<double>(produced);
}

// speexdsp at its lowest quality, straight on interleaved 16-bit; its state stays for the run.
void bm_speex_q0(benchmark::State& state, double ratio) {
    const Block b = make_block(ratio);
    std::vector<int16_t> out(b.input.size() * 2 + 256);
    int err = 0;
    SpeexResamplerState* st = speex_resampler_init(2, kRate, b.out_rate, 0, &err);
    if (st == nullptr) {
        state.SkipWithError(speex_resampler_strerror(err));
        return;
    }
    spx_uint32_t produced = 0;
    for (auto _ : state) {
        spx_uint32_t in_len = static_cast<spx_uint32_t>(b.in_samples / 2);
        spx_uint32_t out_len = static_cast<spx_uint32_t>(out.size() / 2);
        speex_resampler_process_interleaved_int(st, b.input.data(), &in_len, out.data(), &out_len);
        benchmark::DoNotOptimize(out.data());
        benchmark::ClobberMemory();
        produced = out_len * 2;
    }
    speex_resampler_destroy(st);
    set_counters(state, b);
    state.counters["out_samples"] = produced;
}

// speexdsp at quality 0 through its float interface, on float data converted beforehand.
void bm_speex_q0_float(benchmark::State& state, double ratio) {
    const Block b = make_block(ratio);
    std::vector<float> fin(b.input.begin(), b.input.end());
    std::vector<float> fout(b.input.size() * 2 + 256);
    int err = 0;
    SpeexResamplerState* st = speex_resampler_init(2, kRate, b.out_rate, 0, &err);
    if (st == nullptr) {
        state.SkipWithError(speex_resampler_strerror(err));
        return;
    }
    for (auto _ : state) {
        spx_uint32_t in_len = static_cast<spx_uint32_t>(b.in_samples / 2);
        spx_uint32_t out_len = static_cast<spx_uint32_t>(fout.size() / 2);
        speex_resampler_process_interleaved_float(st, fin.data(), &in_len, fout.data(), &out_len);
        benchmark::DoNotOptimize(fout.data());
        benchmark::ClobberMemory();
    }
    speex_resampler_destroy(st);
    set_counters(state, b);
}

// The peers' float paths, without 16-bit conversions: no targets, for comparison only.
int float_summary(const Results& r, std::ostream& out) {
    out << "\n### Resampling, the peers on float data (no 16-bit conversions; CPU time per "
           "block)\n\n| ratio | library ns (16-bit) | SRC_LINEAR float ns | speexdsp q0 float ns "
           "| SRC float / library | speex float / library |\n|---|---|---|---|---|---|\n";
    for (const RatioCase& rc : kRatios) {
        const Measured* k = find(r, name_of("kova", rc));
        const Measured* s = find(r, name_of("src_linear_float", rc));
        const Measured* x = find(r, name_of("speex_q0_float", rc));
        if (!k) continue;
        out << "| " << rc.label << " | " << fixed(k->cpu_ns, 0) << " | "
            << (s ? fixed(s->cpu_ns, 0) : "-") << " | " << (x ? fixed(x->cpu_ns, 0) : "-") << " | "
            << (s ? fixed(s->cpu_ns / k->cpu_ns, 2) + "x" : "-") << " | "
            << (x ? fixed(x->cpu_ns / k->cpu_ns, 2) + "x" : "-") << " |\n";
    }
    return 0;
}

int summary(const Results& r, std::ostream& out) {
    int missed = 0;
    out << "\n### Resampling one pitch-raised move block (48000 Hz stereo, CPU time per block)\n\n"
        << "| ratio | samples in | library ns | SRC_LINEAR ns | speexdsp q0 ns "
        << "| vs SRC_LINEAR (target >= 3x) | vs speexdsp (target >= 1.5x) |\n"
        << "|---|---|---|---|---|---|---|\n";
    for (const RatioCase& rc : kRatios) {
        const Measured* k = find(r, name_of("kova", rc));
        const Measured* s = find(r, name_of("src_linear", rc));
        const Measured* x = find(r, name_of("speex_q0", rc));
        if (!k) continue;
        out << "| " << rc.label << " | " << fixed(k->counters.at("in_samples"), 0) << " | "
            << fixed(k->cpu_ns, 0) << " | " << (s ? fixed(s->cpu_ns, 0) : "-") << " | "
            << (x ? fixed(x->cpu_ns, 0) : "-") << " | ";
        if (s) {
            const double f = s->cpu_ns / k->cpu_ns;
            missed += f < 3.0;
            out << fixed(f, 2) << "x " << verdict(f >= 3.0);
        }
        out << " | ";
        if (x) {
            const double f = x->cpu_ns / k->cpu_ns;
            missed += f < 1.5;
            out << fixed(f, 2) << "x " << verdict(f >= 1.5);
        }
        out << " |\n";
    }
    return missed;
}

}  // namespace

void register_resample_benchmarks() {
    check_against_reference();
    for (const RatioCase& rc : kRatios) {
        benchmark::RegisterBenchmark(name_of("kova", rc).c_str(), bm_kova, rc.ratio);
        benchmark::RegisterBenchmark(name_of("src_linear", rc).c_str(), bm_src_linear, rc.ratio,
                                     true);
        benchmark::RegisterBenchmark(name_of("src_linear_float", rc).c_str(), bm_src_linear,
                                     rc.ratio, false);
        benchmark::RegisterBenchmark(name_of("speex_q0", rc).c_str(), bm_speex_q0, rc.ratio);
        benchmark::RegisterBenchmark(name_of("speex_q0_float", rc).c_str(), bm_speex_q0_float,
                                     rc.ratio);
    }
    add_section(10, summary);
    add_section(11, float_summary);
}

}  // namespace kova_bench
