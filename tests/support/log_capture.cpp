// SPDX-License-Identifier: Apache-2.0
#include "support/log_capture.h"

#include <android/log.h>

#include <mutex>

namespace kova_test {
namespace {

std::mutex g_lock;
std::vector<LogLine> g_lines;

void record(const __android_logger_data* data, const char* message) {
    std::lock_guard<std::mutex> guard(g_lock);
    g_lines.push_back({data->priority, data->tag ? data->tag : "", message ? message : ""});
}

}  // namespace

LogCapture::LogCapture() {
    clear();
    // The host default filters debug lines out; record everything.
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    __android_log_set_logger(record);
}

LogCapture::~LogCapture() {
    __android_log_set_logger(__android_log_stderr_logger);
}

std::vector<LogLine> LogCapture::lines() const {
    std::lock_guard<std::mutex> guard(g_lock);
    return g_lines;
}

std::vector<std::string> LogCapture::messages(const std::string& tag) const {
    std::lock_guard<std::mutex> guard(g_lock);
    std::vector<std::string> out;
    for (const LogLine& line : g_lines) {
        if (line.tag == tag) out.push_back(line.message);
    }
    return out;
}

void LogCapture::clear() {
    std::lock_guard<std::mutex> guard(g_lock);
    g_lines.clear();
}

}  // namespace kova_test
