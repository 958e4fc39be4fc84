#include "cli.h"

#include <android/log.h>
#include <fcntl.h>
#include <unistd.h>

#include <charconv>
#include <cmath>

namespace kova_tool {
namespace {

std::FILE* g_out = stdout;
std::FILE* g_info = stdout;
std::FILE* g_null = nullptr;
bool g_quiet = false;
int g_saved_stdout = -1;

}  // namespace

void usage_error(const std::string& what) {
    throw ToolError(kExitUsage, what);
}

void failure(const std::string& what) {
    throw ToolError(kExitFailure, what);
}

std::FILE* out() {
    return g_out;
}

std::FILE* info() {
    if (!g_quiet) return g_info;
    if (!g_null) g_null = std::fopen("/dev/null", "w");
    return g_null ? g_null : stderr;
}

void set_quiet(bool quiet) {
    g_quiet = quiet;
}

bool quiet() {
    return g_quiet;
}

void data_on_stdout() {
    g_info = stderr;
}

void note(const std::string& text) {
    if (!g_quiet) std::fprintf(stderr, "kova: note: %s\n", text.c_str());
}

void init_output() {
    // The tool writes through a duplicate of the original standard output, so descriptor 1 can be
    // pointed at /dev/null while library calls run.
    std::fflush(stdout);
    g_saved_stdout = dup(STDOUT_FILENO);
    if (g_saved_stdout < 0) return;
    std::FILE* f = fdopen(g_saved_stdout, "w");
    if (f) g_out = g_info = f;
    set_library_chatter(false);
}

void set_library_chatter(bool verbose) {
    std::fflush(stdout);
    if (verbose) {
        if (g_saved_stdout >= 0) dup2(g_saved_stdout, STDOUT_FILENO);
        __android_log_set_minimum_priority(ANDROID_LOG_DEBUG);
        return;
    }
    int null_fd = open("/dev/null", O_WRONLY | O_CLOEXEC);
    if (null_fd >= 0 && g_saved_stdout >= 0) dup2(null_fd, STDOUT_FILENO);
    if (null_fd >= 0) close(null_fd);
    // The output stream logs at debug level; a person running the tool wants warnings only.
    __android_log_set_minimum_priority(ANDROID_LOG_WARN);
}

std::string in_quotes(std::string_view text) {
    return "'" + std::string(text) + "'";
}

std::string num(double value) {
    if (value == std::floor(value) && std::fabs(value) < 1e15) {
        return std::to_string(static_cast<long long>(value));
    }
    char buf[64];
    auto res = std::to_chars(buf, buf + sizeof buf, value);
    return std::string(buf, res.ptr);
}

}  // namespace kova_tool
