/* Tone generator with a whole-sample period: square, sawtooth or sine. */
#include <cmath>
#include <cstdio>

#include "kova/kova_dsp.h"
#include "util/kova_mem.h"
#include "dsp/exact_math.h"
#include "dsp/dsp_internal.h"

namespace {

using kova::dsp::kTwoPi;

constexpr uint32_t kSquare = 1;
constexpr uint32_t kSawtooth = 2;
constexpr double kInitialFreq = 10.0;
/* Far above any real period and small enough that the int64 conversion is defined. */
constexpr double kMaxPeriod = 4611686018427387904.0; /* 2^62 */

bool valid(const KOVA_OSC* osc) {
    return osc != nullptr && osc->tag == KOVA_OSC_TAG;
}

/* Samples per cycle, truncated. Kept at least 1: a frequency at or above the sample rate (or a
 * sample rate below 1) would give 0 and the phase advance would divide by zero; a single-sample
 * cycle is the nearest meaningful tone. Also bounded above so the conversion stays defined. */
int64_t period_for(int32_t sample_rate, double freq) {
    double p = static_cast<double>(sample_rate) / freq;
    if (!(p >= 1.0)) return 1; /* also catches NaN */
    if (p > kMaxPeriod) return static_cast<int64_t>(kMaxPeriod);
    return static_cast<int64_t>(p);
}

double value_at(const KOVA_OSC* osc) {
    switch (osc->waveform) {
        case kSquare:
            return osc->phase < osc->period / 2 ? 1.0 : -1.0;
        case kSawtooth: {
            double x = static_cast<double>(osc->phase) / static_cast<double>(osc->period);
            return 2.0 * (x - std::floor(x + 0.5));
        }
        default:
            return std::sin(kTwoPi * static_cast<double>(osc->phase) /
                            static_cast<double>(osc->period));
    }
}

/* Two channels hand out each value twice so both samples of a frame match. */
void advance(KOVA_OSC* osc) {
    if (osc->channels == 2) {
        if (osc->hold == 0) {
            osc->hold = 1;
            return;
        }
        osc->hold = 0;
    }
    /* The remainder only matters when the phase reaches the period, or lies beyond it after a
     * frequency change; below it the division is skipped (phase >= 0, period >= 1). */
    const int64_t next = osc->phase + 1;
    osc->phase = next < osc->period ? next : next % osc->period;
}

}  // namespace

extern "C" {

KOVA_OSC* kova_osc_init(int32_t sample_rate, uint32_t channels, uint32_t waveform) {
    auto* osc = static_cast<KOVA_OSC*>(kova_mem_calloc(1, sizeof(KOVA_OSC)));
    if (osc == nullptr) {
        puts("KOVA_CTX malloc fail ");
        puts("kova_osc_init() fail. err code (KOVA_ERR_INSUFF_MEM) ");
        return nullptr;
    }
    osc->tag = KOVA_OSC_TAG;
    osc->self = osc;
    osc->sample_rate = sample_rate;
    osc->channels = channels;
    osc->waveform = waveform;
    osc->freq = kInitialFreq;
    osc->period = period_for(sample_rate, kInitialFreq);
    osc->phase = 0;
    osc->hold = 0;
    return osc;
}

int32_t kova_osc_deinit(KOVA_OSC* osc) {
    if (!valid(osc)) return KOVA_ERR_INVALID_PARAM;
    osc->tag = 0; /* a stale handle is refused rather than reused */
    kova_mem_free(osc);
    return KOVA_OK;
}

int32_t kova_osc_set_freq(KOVA_OSC* osc, double freq) {
    if (!valid(osc)) return KOVA_ERR_INVALID_PARAM;
    /* NaN is treated like a non-positive frequency. */
    if (!(freq > 0.0)) freq = 1.0;
    osc->freq = freq;
    osc->period = period_for(osc->sample_rate, freq);
    return KOVA_OK;
}

double kova_osc_get_sample(KOVA_OSC* osc) {
    if (!valid(osc)) return static_cast<double>(KOVA_ERR_INVALID_PARAM);
    double v = value_at(osc);
    advance(osc);
    return v;
}

void _osc_fill(KOVA_OSC* osc, double* out, int64_t count) {
    if (!valid(osc)) {
        for (int64_t i = 0; i < count; ++i) out[i] = static_cast<double>(KOVA_ERR_INVALID_PARAM);
        return;
    }
    /* The period is fixed for the whole call, so a value depends on the phase alone: each phase
     * below kKnown is computed once and reused (both samples of a stereo frame, and every cycle
     * after the first); phases above it are computed as they come. */
    constexpr int64_t kKnown = 512;
    double value[kKnown];
    bool known[kKnown] = {};
    for (int64_t i = 0; i < count; ++i) {
        const int64_t phase = osc->phase;
        if (phase < kKnown) {
            if (!known[phase]) {
                value[phase] = value_at(osc);
                known[phase] = true;
            }
            out[i] = value[phase];
        } else {
            out[i] = value_at(osc);
        }
        advance(osc);
    }
}

int32_t kova_osc_gen_samples(KOVA_OSC* osc, int16_t* buf, int32_t bytes) {
    if (!valid(osc) || buf == nullptr || bytes < 1) return KOVA_ERR_INVALID_PARAM;
    const int32_t count = bytes / 2;
    for (int32_t i = 0; i < count; ++i) {
        buf[i] = static_cast<int16_t>(static_cast<int32_t>(value_at(osc) * 32767.0));
        advance(osc);
    }
    return count;
}

}  // extern "C"
