/* An engine context with the source set that the command line describes. */
#ifndef KOVA_TOOL_SOURCES_H
#define KOVA_TOOL_SOURCES_H

#include <kova/kova_types.h>

#include <string>
#include <vector>

#include "gesture.h"
#include "options.h"

namespace kova_tool {

/* Owns one engine context (kova_init / kova_deinit). */
class Engine {
   public:
    explicit Engine(const FormatOptions& opts);
    ~Engine();
    Engine(const Engine&) = delete;
    Engine& operator=(const Engine&) = delete;

    KOVA_CTX* ctx() const { return ctx_; }
    const KOVA_FORMAT& format() const { return format_; }

   private:
    KOVA_FORMAT format_{};
    KOVA_CTX* ctx_ = nullptr;
};

struct PreparedSet {
    int32_t id = 0;
    bool noise_loop = false; /* the loop slot holds generated noise (level from wn_gain) */
};

/* Registers the set, makes it active, and applies repeat points, tune values, thickness and
 * volume. Input files are checked first, so a missing or unreadable one fails with its own
 * reason rather than a bare library code. */
PreparedSet prepare_set(Engine& engine, const SetupOptions& setup);

/* Generates the block of one touch event into `block`; returns the bytes produced (0 when nothing
 * sounds), as kova_gen_sounds does. */
int32_t generate_event(const Engine& engine, const TouchEvent& e, std::vector<int16_t>& block);

/* "source could not be loaded (-4)" and the like. */
std::string library_error(int32_t code);

}  // namespace kova_tool

#endif
