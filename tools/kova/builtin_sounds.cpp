#include "builtin_sounds.h"

#include <algorithm>
#include <cmath>
#include <functional>
#include <numbers>

namespace kova_tool {
namespace {

constexpr double kTwoPi = 2.0 * std::numbers::pi;
constexpr double kFadeMs = 5.0; /* fade at the end, so a cut sound does not click */

std::vector<int16_t> render(uint32_t rate, uint32_t channels, uint32_t max_bytes, int ms,
                            const std::function<double(double)>& wave) {
    const uint32_t frame_bytes = 2 * channels;
    const uint32_t frames =
        std::min<uint32_t>(rate * static_cast<uint32_t>(ms) / 1000, max_bytes / frame_bytes);
    std::vector<int16_t> pcm(static_cast<size_t>(frames) * channels);
    const double fade = kFadeMs * rate / 1000.0;
    for (uint32_t i = 0; i < frames; ++i) {
        const double t = static_cast<double>(i) / rate;
        double v = wave(t) * std::min(1.0, (frames - i) / fade);
        v = std::clamp(v, -1.0, 1.0) * 32767.0;
        for (uint32_t c = 0; c < channels; ++c) pcm[i * channels + c] = static_cast<int16_t>(v);
    }
    return pcm;
}

/* A fixed xorshift sequence mapped to -1..1, for the tick's noise burst. */
class Noise {
   public:
    double next() {
        state_ ^= state_ << 13;
        state_ ^= state_ >> 17;
        state_ ^= state_ << 5;
        return static_cast<double>(state_) / 2147483648.0 - 1.0;
    }

   private:
    uint32_t state_ = 0x4B4F5641u;
};

}  // namespace

/* The pen touching down: a 4 ms noise burst over a ringing 2500 Hz + 3700 Hz pair that decays
 * with a 10 ms time constant; peak at full scale. The tones lie inside the built-in set's band,
 * which filters the start sound too, so the tick keeps its level there. */
std::vector<int16_t> builtin_start_sound(uint32_t rate, uint32_t channels, uint32_t max_bytes) {
    Noise noise;
    return render(rate, channels, max_bytes, kBuiltinStartMs, [&](double t) {
        const double ring =
            0.8 * std::sin(kTwoPi * 2500.0 * t) + 0.2 * std::sin(kTwoPi * 3700.0 * t);
        const double burst = t < 0.004 ? 0.3 * noise.next() * (1.0 - t / 0.004) : 0.0;
        return std::exp(-t / 0.010) * ring + burst;
    });
}

/* The pen lifting off: a tone gliding down from 1800 Hz towards 900 Hz with a soft 2 ms onset
 * and a 30 ms decay; peak about 0.8 of full scale. */
std::vector<int16_t> builtin_end_sound(uint32_t rate, uint32_t channels, uint32_t max_bytes) {
    return render(rate, channels, max_bytes, kBuiltinEndMs, [](double t) {
        // Phase of a glide whose frequency falls exponentially from 1800 Hz to 900 Hz (tau 40 ms).
        const double tau = 0.040;
        const double phase = kTwoPi * (900.0 * t + 900.0 * tau * (1.0 - std::exp(-t / tau)));
        const double onset = std::min(1.0, t / 0.002);
        return 0.8 * onset * std::exp(-t / 0.030) *
               (0.8 * std::sin(phase) + 0.2 * std::sin(2.0 * phase));
    });
}

}  // namespace kova_tool
