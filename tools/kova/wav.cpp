#include "wav.h"

#include <sndfile.h>

#include "cli.h"
#include "output_file.h"

namespace kova_tool {

void write_wav(OutputFile& file, const std::vector<int16_t>& pcm, uint32_t rate,
               uint32_t channels) {
    const std::string& path = file.path();
    SF_INFO info{};
    info.samplerate = static_cast<int>(rate);
    info.channels = static_cast<int>(channels);
    info.format = SF_FORMAT_WAV | SF_FORMAT_PCM_16;
    SNDFILE* snd = sf_open_fd(file.fd(), SFM_WRITE, &info, SF_FALSE);
    if (!snd) failure("cannot write " + in_quotes(path) + ": " + sf_strerror(nullptr));
    const auto frames = static_cast<sf_count_t>(pcm.size() / channels);
    const sf_count_t written = sf_writef_short(snd, pcm.data(), frames);
    const std::string error = written == frames ? "" : sf_strerror(snd);
    if (sf_close(snd) != 0 || !error.empty()) {
        failure("cannot write " + in_quotes(path) + ": " +
                (error.empty() ? "close failed" : error));
    }
}

}  // namespace kova_tool
