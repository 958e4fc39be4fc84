/* Touch gestures: the events a stroke produces, read from CSV or built in. */
#ifndef KOVA_TOOL_GESTURE_H
#define KOVA_TOOL_GESTURE_H

#include <cstdint>
#include <cstdio>
#include <string>
#include <vector>

#include "options.h"

namespace kova_tool {

struct TouchEvent {
    int64_t time_ms = 0;
    uint32_t action = 0; /* KOVA_ACTION_START, _MOVE or _END */
    float x = 0;
    float y = 0;
    float aux = 0;
};

/* Reads a gesture CSV: a header "time_ms,action,x,y[,aux]", then one event per line; '#' lines
 * and blank lines are skipped. Actions: down/move/up (or start/end, or 0/1/2). Times are whole
 * milliseconds, 0 or more, never decreasing; x and y are pixels, 0 or more. A malformed file
 * fails with "FILE:LINE: what is wrong". */
std::vector<TouchEvent> read_gesture_csv(const std::string& path);
void write_gesture_csv(std::FILE* f, const std::vector<TouchEvent>& events);

/* The built-in gestures, sampled at `touch_hz` on a w x h screen; empty for an unknown name. */
std::vector<TouchEvent> builtin_gesture(const std::string& name, uint32_t touch_hz, uint32_t w,
                                        uint32_t h);

/* A built-in gesture by name, or the CSV file of that name. */
std::vector<TouchEvent> load_gesture(const GestureOptions& opts, uint32_t w, uint32_t h);

const char* action_name(uint32_t action);

}  // namespace kova_tool

#endif
