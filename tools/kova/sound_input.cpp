#include "sound_input.h"

#include <samplerate.h>
#include <sndfile.h>

#include <algorithm>
#include <filesystem>
#include <memory>

#include "cli.h"
#include "input_file.h"
#include "options.h"

namespace kova_tool {
namespace {

constexpr uint32_t kSlotMax[KOVA_SLOT_COUNT] = {KOVA_SLOT_START_MAX_BYTES, KOVA_SLOT_LOOP_MAX_BYTES,
                                                KOVA_SLOT_END_MAX_BYTES};
/* The engine repeats the loop between positions derived from its length (a quarter and the end,
 * less 4 samples); below a few milliseconds nothing is left to play. */
constexpr uint32_t kMinLoopMs = 5;

bool named_raw(const std::string& path) {
    const std::string ext = CLI::detail::to_lower(std::filesystem::path(path).extension());
    return ext == ".raw" || ext == ".pcm";
}

std::string describe(int rate, int channels, const std::string& samples) {
    return samples + ", " + std::to_string(rate) + " Hz, " + std::to_string(channels) +
           (channels == 1 ? " channel" : " channels");
}

std::string format_name(int format) {
    SF_FORMAT_INFO fi{};
    fi.format = format;
    return sf_command(nullptr, SFC_GET_FORMAT_INFO, &fi, sizeof fi) == 0 && fi.name ? fi.name
                                                                                    : "unknown";
}

/* Interleaved frames of `in_ch` channels mixed to `out_ch`: each output channel is the mean of the
 * input channels that fall on it (c % out_ch), so mono is duplicated and stereo averaged. */
std::vector<float> remix(const std::vector<float>& in, int in_ch, int out_ch) {
    if (in_ch == out_ch) return in;
    const size_t frames = in.size() / static_cast<size_t>(in_ch);
    std::vector<float> out(frames * static_cast<size_t>(out_ch));
    for (size_t f = 0; f < frames; ++f) {
        for (int o = 0; o < out_ch; ++o) {
            double sum = 0;
            int n = 0;
            for (int c = o % in_ch; c < in_ch; c += out_ch, ++n) sum += in[f * in_ch + c];
            out[f * out_ch + o] = static_cast<float>(sum / n);
        }
    }
    return out;
}

}  // namespace

std::vector<int16_t> read_sound(const std::string& path, int slot, const KOVA_FORMAT& fmt,
                                bool raw) {
    const std::string what = std::string(slot_name(slot)) + " sound";
    const InputFile file(path, what);
    const int ch = static_cast<int>(fmt.channels), rate = static_cast<int>(fmt.sample_rate);
    const size_t max_frames = kSlotMax[slot] / (2u * fmt.channels);
    std::vector<int16_t> pcm;
    size_t frames_in_file = 0;
    if (raw || named_raw(path)) {
        const std::string bytes = file.head(static_cast<int64_t>(kSlotMax[slot]));
        frames_in_file = static_cast<size_t>(file.size()) / (2u * fmt.channels);
        pcm.resize(std::min(frames_in_file, max_frames) * fmt.channels);
        std::copy_n(bytes.data(), pcm.size() * 2, reinterpret_cast<char*>(pcm.data()));
    } else {
        SF_INFO info{};
        std::unique_ptr<SNDFILE, int (*)(SNDFILE*)> snd(
            sf_open_fd(file.fd(), SFM_READ, &info, SF_FALSE), sf_close);
        if (!snd) {
            file.fail(std::string(sf_strerror(nullptr)) +
                      " (raw PCM: name it *.raw or *.pcm, or give --raw)");
        }
        frames_in_file = static_cast<size_t>(std::max<sf_count_t>(info.frames, 0));
        const bool exact =
            (info.format & SF_FORMAT_SUBMASK) == SF_FORMAT_PCM_16 && info.samplerate == rate;
        // Read no more than the slot keeps: a header may claim any length.
        const double ratio = static_cast<double>(rate) / info.samplerate;
        const size_t want = std::min<size_t>(
            frames_in_file, static_cast<size_t>(static_cast<double>(max_frames) / ratio) + 64);
        // Through floats: 16-bit samples come back exactly (x / 32768, then x 32768 again).
        std::vector<float> in(want * static_cast<size_t>(info.channels));
        in.resize(static_cast<size_t>(
                      sf_readf_float(snd.get(), in.data(), static_cast<sf_count_t>(want))) *
                  static_cast<size_t>(info.channels));
        std::vector<float> mixed = remix(in, info.channels, ch);
        if (info.samplerate != rate) {
            const size_t frames = mixed.size() / static_cast<size_t>(ch);
            std::vector<float> resampled(
                (static_cast<size_t>(static_cast<double>(frames) * ratio) + 16) * ch);
            SRC_DATA d{};
            d.data_in = mixed.data();
            d.input_frames = static_cast<long>(frames);
            d.data_out = resampled.data();
            d.output_frames = static_cast<long>(resampled.size() / static_cast<size_t>(ch));
            d.src_ratio = ratio;
            const int rc = src_simple(&d, SRC_SINC_BEST_QUALITY, ch);
            if (rc != 0) file.fail(std::string("resampling failed: ") + src_strerror(rc));
            resampled.resize(static_cast<size_t>(d.output_frames_gen) * ch);
            mixed.swap(resampled);
        }
        pcm.resize(mixed.size());
        src_float_to_short_array(mixed.data(), pcm.data(), static_cast<int>(mixed.size()));
        if (!exact || info.channels != ch) {
            note("converted " + what + " " + in_quotes(path) + " (" +
                 format_name(info.format & SF_FORMAT_TYPEMASK) + ", " +
                 describe(info.samplerate, info.channels,
                          format_name(info.format & SF_FORMAT_SUBMASK)) +
                 ") to " + describe(rate, ch, "16-bit"));
        }
        frames_in_file = static_cast<size_t>(static_cast<double>(frames_in_file) * ratio);
        if (pcm.size() > max_frames * fmt.channels) pcm.resize(max_frames * fmt.channels);
    }
    const size_t frames = pcm.size() / fmt.channels;
    const size_t min_frames = slot == KOVA_SLOT_LOOP ? fmt.sample_rate * kMinLoopMs / 1000 : 1;
    if (frames < min_frames) {
        file.fail(
            "it holds " + std::to_string(frames) + " frame" + (frames == 1 ? "" : "s") + " of " +
            std::to_string(ch) + " channel" + (ch == 1 ? "" : "s") + " at " + std::to_string(rate) +
            " Hz; a " + what + " needs at least " + std::to_string(min_frames) + " (" +
            (slot == KOVA_SLOT_LOOP ? std::to_string(kMinLoopMs) + " ms" : "one frame") + ")");
    }
    if (frames_in_file > max_frames) {
        note(in_quotes(path) + " lasts " + std::to_string(frames_in_file * 1000 / fmt.sample_rate) +
             " ms; the " + slot_name(slot) + " slot keeps the first " +
             std::to_string(max_frames * 1000 / fmt.sample_rate) + " ms (" +
             std::to_string(kSlotMax[slot]) + " bytes)");
    }
    return pcm;
}

}  // namespace kova_tool
