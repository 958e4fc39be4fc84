#include "gesture.h"

#include <kova/kova_types.h>

#include <algorithm>
#include <cerrno>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <sstream>
#include <functional>
#include <numbers>

#include "input_file.h"

namespace kova_tool {
namespace {

constexpr size_t kMaxEvents = 1000000;
/* A million events of about 30 bytes each, with room for comments. */
constexpr int64_t kMaxCsvBytes = 64LL << 20;
constexpr int64_t kMaxTimeMs = 24LL * 3600 * 1000;

struct Point {
    double x;
    double y;
};

/* The cells of one CSV line, trimmed. */
std::vector<std::string> split(const std::string& line) {
    std::vector<std::string> cells = CLI::detail::split(line, ',');
    for (std::string& c : cells) CLI::detail::trim(c);
    return cells;
}

bool parse_action(const std::string& text, uint32_t& action) {
    static const std::pair<const char*, uint32_t> names[] = {
        {"down", KOVA_ACTION_START}, {"start", KOVA_ACTION_START}, {"0", KOVA_ACTION_START},
        {"move", KOVA_ACTION_MOVE},  {"1", KOVA_ACTION_MOVE},      {"up", KOVA_ACTION_END},
        {"end", KOVA_ACTION_END},    {"2", KOVA_ACTION_END}};
    for (const auto& [name, code] : names) {
        if (CLI::detail::to_lower(text) == name) return action = code, true;
    }
    return false;
}

bool parse_number(const std::string& text, double& v) {
    errno = 0;
    char* end = nullptr;
    v = std::strtod(text.c_str(), &end);
    return !text.empty() && end == text.c_str() + text.size() && errno != ERANGE &&
           std::isfinite(v);
}

/* One stroke: down at `t0`, a move every 1/touch_hz s along `path` (a function of the elapsed
 * fraction 0..1 of `duration_ms`), and up one touch period after the last move, where the finger
 * was last seen, as a touch screen reports it. */
void append_stroke(std::vector<TouchEvent>& ev, int64_t t0, int64_t duration_ms, uint32_t hz,
                   const std::function<Point(double)>& path, uint32_t w, uint32_t h) {
    auto clamp = [&](Point p) {
        return Point{std::clamp(p.x, 0.0, static_cast<double>(w)),
                     std::clamp(p.y, 0.0, static_cast<double>(h))};
    };
    auto at = [&](int64_t k) { return t0 + (k * 1000 + hz / 2) / hz; };
    Point p = clamp(path(0.0));
    ev.push_back({t0, KOVA_ACTION_START, static_cast<float>(p.x), static_cast<float>(p.y), 0.0f});
    int64_t k = 1;
    for (; at(k) - t0 <= duration_ms; ++k) {
        p = clamp(path(static_cast<double>(at(k) - t0) / static_cast<double>(duration_ms)));
        ev.push_back(
            {at(k), KOVA_ACTION_MOVE, static_cast<float>(p.x), static_cast<float>(p.y), 0.0f});
    }
    ev.push_back({at(k), KOVA_ACTION_END, static_cast<float>(p.x), static_cast<float>(p.y), 0.0f});
}

/* Path fraction for time fraction s with a speed that varies by `swing` around its mean (0: even
 * speed; 1: starts and ends at rest). */
double ease(double s, double swing) {
    return s - swing * std::sin(2.0 * std::numbers::pi * s) / (2.0 * std::numbers::pi);
}

}  // namespace

const char* action_name(uint32_t action) {
    static const char* const names[] = {"down", "move", "up"};
    return action <= KOVA_ACTION_END ? names[action] : "?";
}

std::vector<TouchEvent> builtin_gesture(const std::string& name, uint32_t hz, uint32_t w,
                                        uint32_t h) {
    std::vector<TouchEvent> ev;
    const double cx = w / 2.0, cy = h / 2.0, pi = std::numbers::pi;
    const auto stroke = [&](int64_t t0, int64_t ms, double swing, auto path) {
        append_stroke(
            ev, t0, ms, hz, [&](double s) { return path(ease(s, swing)); }, w, h);
    };
    // About 0.4 to 0.7 px/ms down the screen: a slow scroll. Every 8 ms step stays above the 3 px
    // the engine needs to count a move.
    const auto slow = [&](int64_t t0, int64_t ms) {
        stroke(t0, ms, 0.25, [&](double u) {
            return Point{cx - 60.0 + 120.0 * u + 40.0 * std::sin(2.0 * pi * u),
                         cy - 450.0 + 900.0 * u};
        });
    };
    // A flick of about 1400 px in 300 ms: from rest up to about 9 px/ms and back.
    const auto fast = [&](int64_t t0) {
        stroke(t0, 300, 0.8, [&](double u) {
            return Point{cx - 300.0 + 600.0 * u, cy + 600.0 - 1300.0 * u};
        });
    };
    if (name == "slow") {
        slow(0, 1600);
    } else if (name == "fast") {
        fast(0);
    } else if (name == "strokes") {
        // Three strokes with pauses between them: a sweep of about 1.4 px/ms to the right along an
        // arc, a flick, a slow scroll.
        stroke(0, 600, 0.5, [&](double u) {
            return Point{cx - 400.0 + 800.0 * u, cy + 200.0 - 300.0 * std::sin(pi * u)};
        });
        fast(ev.back().time_ms + 500);
        slow(ev.back().time_ms + 600, 1000);
    }
    return ev;
}

std::vector<TouchEvent> read_gesture_csv(const std::string& path) {
    std::string text = InputFile(path, "gesture file").read_all(kMaxCsvBytes);
    // Spreadsheet programs save UTF-8 with a byte-order mark.
    if (text.rfind("\xEF\xBB\xBF", 0) == 0) text.erase(0, 3);
    std::istringstream in(text);
    std::vector<TouchEvent> events;
    std::string line;
    int lineno = 0;
    bool header = false;
    auto bad = [&](const std::string& what) {
        failure(path + ":" + std::to_string(lineno) + ": " + what);
    };
    while (std::getline(in, line)) {
        ++lineno;
        const std::string t = CLI::detail::trim_copy(line);
        if (t.empty() || t[0] == '#') continue;
        std::vector<std::string> cells = split(t);
        if (!header) {
            for (std::string& c : cells) c = CLI::detail::to_lower(c);
            const bool ok = cells.size() >= 4 && cells.size() <= 5 && cells[0] == "time_ms" &&
                            cells[1] == "action" && cells[2] == "x" && cells[3] == "y" &&
                            (cells.size() == 4 || cells[4] == "aux");
            if (!ok) bad("the first line must be the header time_ms,action,x,y[,aux]");
            header = true;
            continue;
        }
        if (cells.size() < 4 || cells.size() > 5) {
            bad(std::to_string(cells.size()) +
                " fields (expected 4 or 5: time_ms,action,x,y[,aux])");
        }
        TouchEvent e;
        double v = 0;
        if (!parse_number(cells[0], v) || v != std::floor(v) || v < 0 || v > kMaxTimeMs) {
            bad("time_ms " + in_quotes(cells[0]) + " is not a whole number of ms in 0.." +
                std::to_string(kMaxTimeMs));
        }
        e.time_ms = static_cast<int64_t>(v);
        if (!events.empty() && e.time_ms < events.back().time_ms) {
            bad("time_ms " + cells[0] + " is earlier than the line before (" +
                std::to_string(events.back().time_ms) + ")");
        }
        if (!parse_action(cells[1], e.action)) {
            bad("action " + in_quotes(cells[1]) +
                " is unknown (accepted: down, move, up or 0, 1, 2)");
        }
        const char* names[] = {"x", "y", "aux"};
        float* fields[] = {&e.x, &e.y, &e.aux};
        for (size_t i = 0; i + 2 < cells.size(); ++i) {
            if (!parse_number(cells[i + 2], v) || (i < 2 && (v < 0 || v > 1e6))) {
                bad(std::string(names[i]) + " " + in_quotes(cells[i + 2]) +
                    (i < 2 ? " is not a number of pixels in 0..1000000" : " is not a number"));
            }
            *fields[i] = static_cast<float>(v);
        }
        if (events.size() == kMaxEvents) bad("more than " + std::to_string(kMaxEvents) + " events");
        events.push_back(e);
    }
    if (!header) failure(path + ": no header line time_ms,action,x,y[,aux]");
    if (events.empty()) failure(path + ": no events after the header");
    return events;
}

void write_gesture_csv(std::FILE* f, const std::vector<TouchEvent>& events) {
    std::fprintf(f, "time_ms,action,x,y,aux\n");
    for (const TouchEvent& e : events) {
        std::fprintf(f, "%lld,%s,%.1f,%.1f,%g\n", static_cast<long long>(e.time_ms),
                     action_name(e.action), static_cast<double>(e.x), static_cast<double>(e.y),
                     static_cast<double>(e.aux));
    }
}

std::vector<TouchEvent> load_gesture(const GestureOptions& opts, uint32_t w, uint32_t h) {
    std::vector<TouchEvent> ev = builtin_gesture(opts.gesture, opts.touch_rate, w, h);
    if (!ev.empty()) return ev;
    return read_gesture_csv(opts.gesture);
}

}  // namespace kova_tool
