// SPDX-License-Identifier: Apache-2.0
// Records what the library sends to the Android log, for tests.
#ifndef KOVA_TEST_LOG_CAPTURE_H
#define KOVA_TEST_LOG_CAPTURE_H

#include <string>
#include <vector>

namespace kova_test {

struct LogLine {
    int priority;
    std::string tag;
    std::string message;

    bool operator==(const LogLine&) const = default;
};

// While an instance lives, every log line of the process (any thread, any priority) is recorded
// instead of printed; the record starts empty. One instance at a time.
class LogCapture {
   public:
    LogCapture();
    ~LogCapture();
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    std::vector<LogLine> lines() const;
    // Messages of one tag, in order.
    std::vector<std::string> messages(const std::string& tag) const;
    void clear();
};

}  // namespace kova_test

#endif
