/* The tool's own start and end sounds, synthesised in code so the built-in set needs no files. */
#ifndef KOVA_TOOL_BUILTIN_SOUNDS_H
#define KOVA_TOOL_BUILTIN_SOUNDS_H

#include <cstdint>
#include <vector>

namespace kova_tool {

/* Lengths of the two sounds (shorter only where a slot's byte limit cuts them). */
constexpr int kBuiltinStartMs = 40;
constexpr int kBuiltinEndMs = 120;

/* Interleaved 16-bit samples of the start "tick" or the end "lift-off" for the given format,
 * the same in every channel and at most `max_bytes` long. Deterministic: the same format always
 * gives the same samples. */
std::vector<int16_t> builtin_start_sound(uint32_t rate, uint32_t channels, uint32_t max_bytes);
std::vector<int16_t> builtin_end_sound(uint32_t rate, uint32_t channels, uint32_t max_bytes);

}  // namespace kova_tool

#endif
