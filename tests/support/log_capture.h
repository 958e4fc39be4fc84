// SPDX-License-Identifier: Apache-2.0
// Records what the library sends to the Android log, for tests.
#ifndef KOVA_TEST_LOG_CAPTURE_H
#define KOVA_TEST_LOG_CAPTURE_H

#include <android/log.h>

#include <mutex>
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
    LogCapture() {
        clear();
        // The host default filters debug lines out; record everything.
        __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
        __android_log_set_logger(record);
    }
    ~LogCapture() { __android_log_set_logger(__android_log_stderr_logger); }
    LogCapture(const LogCapture&) = delete;
    LogCapture& operator=(const LogCapture&) = delete;

    std::vector<LogLine> lines() const {
        std::lock_guard<std::mutex> guard(lock_);
        return lines_;
    }
    void clear() {
        std::lock_guard<std::mutex> guard(lock_);
        lines_.clear();
    }

   private:
    static void record(const __android_logger_data* data, const char* message) {
        std::lock_guard<std::mutex> guard(lock_);
        lines_.push_back({data->priority, data->tag ? data->tag : "", message ? message : ""});
    }
    static inline std::mutex lock_;
    static inline std::vector<LogLine> lines_;
};

}  // namespace kova_test

#endif
