/* Sound files for the start, loop and end slots, in the engine's format. */
#ifndef KOVA_TOOL_SOUND_INPUT_H
#define KOVA_TOOL_SOUND_INPUT_H

#include <kova/kova_types.h>

#include <cstdint>
#include <string>
#include <vector>

namespace kova_tool {

/* The samples of `path` for `slot`, interleaved 16-bit at the format's rate and channels, at most
 * the slot's byte limit (a longer sound is cut, with a note). Files named *.raw or *.pcm, and
 * every file with `raw`, are raw PCM already in that format; anything else is read by libsndfile
 * (WAV, FLAC, Ogg, ...) and converted where it differs: channels mixed or duplicated, the rate by
 * libsamplerate's best sinc converter, samples to 16 bits; one note line says what was
 * converted. A 16-bit file at the engine's rate and channels gives its samples unchanged. Fails
 * with one line for a file that cannot be read, is not a regular file or holds less than a
 * sound. */
std::vector<int16_t> read_sound(const std::string& path, int slot, const KOVA_FORMAT& format,
                                bool raw);

}  // namespace kova_tool

#endif
