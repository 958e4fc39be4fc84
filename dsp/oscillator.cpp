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

double wave_value(uint32_t waveform, int64_t phase, int64_t period) {
    switch (waveform) {
        case kSquare:
            return phase < period / 2 ? 1.0 : -1.0;
        case kSawtooth: {
            double x = static_cast<double>(phase) / static_cast<double>(period);
            return 2.0 * (x - std::floor(x + 0.5));
        }
        default:
            return std::sin(kTwoPi * static_cast<double>(phase) / static_cast<double>(period));
    }
}

double value_at(const KOVA_OSC* osc) {
    return wave_value(osc->waveform, osc->phase, osc->period);
}

/* A value depends only on waveform, phase and period, so whole cycles are kept across calls:
 * the generator sets a new frequency on every move, and a stroke comes back to the same few
 * periods again and again. Each table holds one cycle of a period up to kTableLen samples;
 * longer cycles are computed as they come. The tables live in the same heap block, behind the
 * record, so the record's layout stays as it is. */
constexpr int64_t kTableLen = 512;
constexpr int kTables = 8;

struct CycleTable {
    int64_t period;    /* 0: empty */
    uint32_t waveform; /* kSquare, kSawtooth or 0 for the sine */
    uint32_t used;     /* clock value of the last use, to replace the least recently used */
    double value[kTableLen];
};

struct OscBlock {
    KOVA_OSC osc; /* first member: the record's address is the block's */
    uint32_t clock;
    CycleTable table[kTables];
};

uint32_t waveform_kind(uint32_t waveform) {
    return (waveform == kSquare || waveform == kSawtooth) ? waveform : 0;
}

/* The cycle of the oscillator's current period, filled on first use; null when the period is
 * outside the tables' range or the record was not made by kova_osc_init (a copy's `self` no
 * longer matches its address, and it has no tables behind it). */
const double* cycle_table(KOVA_OSC* osc) {
    const int64_t period = osc->period;
    if (osc->self != osc || period < 1 || period > kTableLen) return nullptr;
    auto* block = reinterpret_cast<OscBlock*>(osc);
    const uint32_t kind = waveform_kind(osc->waveform);
    const uint32_t now = ++block->clock;
    CycleTable* oldest = &block->table[0];
    for (CycleTable& t : block->table) {
        if (t.period == period && t.waveform == kind) {
            t.used = now;
            return t.value;
        }
        if (t.used < oldest->used) oldest = &t;
    }
    oldest->period = period;
    oldest->waveform = kind;
    oldest->used = now;
    for (int64_t ph = 0; ph < period; ++ph) oldest->value[ph] = wave_value(kind, ph, period);
    return oldest->value;
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
    auto* block = static_cast<OscBlock*>(kova_mem_calloc(1, sizeof(OscBlock)));
    if (block == nullptr) {
        puts("KOVA_CTX malloc fail ");
        puts("kova_osc_init() fail. err code (KOVA_ERR_INSUFF_MEM) ");
        return nullptr;
    }
    KOVA_OSC* osc = &block->osc;
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

/* Exactly the values and state that `count` calls of kova_osc_get_sample would give. */
void _osc_fill(KOVA_OSC* osc, double* out, int64_t count) {
    if (!valid(osc)) {
        for (int64_t i = 0; i < count; ++i) out[i] = static_cast<double>(KOVA_ERR_INVALID_PARAM);
        return;
    }
    int64_t i = 0;
    /* A phase left beyond the period by a frequency change comes back through the remainder. */
    while (i < count && (osc->phase < 0 || osc->phase >= osc->period)) {
        out[i++] = value_at(osc);
        advance(osc);
    }
    const double* cycle = cycle_table(osc);
    if (cycle == nullptr) {
        for (; i < count; ++i) {
            out[i] = value_at(osc);
            advance(osc);
        }
        return;
    }
    const int64_t period = osc->period;
    int64_t phase = osc->phase;
    if (osc->channels == 2) {
        /* Each value twice; `hold` says the first copy of the current one is already out. */
        if (i < count && osc->hold == 1) {
            out[i++] = cycle[phase];
            phase = (phase + 1 == period) ? 0 : phase + 1;
            osc->hold = 0;
        }
        for (; i + 1 < count; i += 2) {
            out[i] = out[i + 1] = cycle[phase];
            phase = (phase + 1 == period) ? 0 : phase + 1;
        }
        if (i < count) {
            out[i] = cycle[phase];
            osc->hold = 1;
        }
    } else {
        for (; i < count; ++i) {
            out[i] = cycle[phase];
            phase = (phase + 1 == period) ? 0 : phase + 1;
        }
    }
    osc->phase = phase;
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
