// SPDX-License-Identifier: Apache-2.0
#include "support/tool_run.h"

#include <gtest/gtest.h>
#include <sndfile.h>
#include <sys/wait.h>

#include <chrono>
#include <cmath>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

namespace kova_test {

namespace {

/* `s` in single quotes, for the shell. */
std::string shell_word(const std::string& s) {
    std::string q = "'";
    for (char c : s) q += c == '\'' ? std::string("'\\''") : std::string(1, c);
    return q + "'";
}

}  // namespace

/* Through the shell: coreutils' timeout sends the signal (and SIGKILL 10 s later) and passes the
 * tool's exit code on; script(1) gives standard error a terminal and copies what it got. */
RunResult run_kova(const std::vector<std::string>& args, const std::string& dir,
                   int sigint_after_ms, const std::vector<std::string>& env, bool stderr_tty) {
    std::string cmd = "env";
    for (const std::string& e : env) cmd += " " + shell_word(e);
    if (sigint_after_ms > 0)
        cmd += " timeout --preserve-status -k 10 -s INT " + std::to_string(sigint_after_ms / 1e3);
    cmd += " " + shell_word(KOVA_TOOL_BINARY);
    for (const std::string& a : args) cmd += " " + shell_word(a);
    cmd += " </dev/null >.stdout";
    cmd = stderr_tty ? "script -qefc " + shell_word(cmd) + " /dev/null </dev/null >.stderr"
                     : cmd + " 2>.stderr";
    const auto start = std::chrono::steady_clock::now();
    const int status = std::system(("cd " + shell_word(dir) + " && " + cmd).c_str());
    const auto ms = std::chrono::duration_cast<std::chrono::milliseconds>(
                        std::chrono::steady_clock::now() - start)
                        .count();
    RunResult r;
    if (WIFEXITED(status)) r.code = WEXITSTATUS(status);
    if (sigint_after_ms > 0) r.exit_ms = ms - sigint_after_ms;
    r.out = read_file(dir + "/.stdout");
    r.err = read_file(dir + "/.stderr");
    std::filesystem::remove(dir + "/.stdout");
    std::filesystem::remove(dir + "/.stderr");
    return r;
}

void write_file(const std::string& path, const std::string& bytes) {
    std::ofstream(path, std::ios::binary | std::ios::trunc) << bytes;
}

size_t count_files(const std::string& dir) {
    return static_cast<size_t>(std::distance(std::filesystem::directory_iterator(dir), {}));
}

bool has(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

std::string stroke_csv(int t0, int last_ms, int y, bool to_and_fro) {
    std::ostringstream s;
    s << t0 << ",down,100," << y << "\n";
    for (int t = t0 + 10; t <= last_ms; t += 10)
        s << t << ",move," << 100 + (to_and_fro ? t / 10 % 2 * 10 : t - t0) << "," << y << "\n";
    if (!to_and_fro) s << last_ms + 10 << ",up,300," << y << "\n";
    return s.str();
}

void write_tone(const std::string& path, int format, int rate, int channels, double seconds) {
    SF_INFO info{};
    info.samplerate = rate;
    info.channels = channels;
    info.format = format;
    SNDFILE* f = sf_open(path.c_str(), SFM_WRITE, &info);
    ASSERT_NE(f, nullptr) << sf_strerror(nullptr);
    std::vector<float> pcm;
    for (int i = 0; i < static_cast<int>(seconds * rate); ++i)
        pcm.insert(pcm.end(), channels,
                   0.1f * static_cast<float>(std::sin(2 * M_PI * 440.0 * i / rate)));
    sf_writef_float(f, pcm.data(), static_cast<sf_count_t>(pcm.size() / channels));
    sf_close(f);
}

Wav read_wav(const std::string& path) {
    Wav w;
    SF_INFO info{};
    SNDFILE* f = sf_open(path.c_str(), SFM_READ, &info);
    if (!f) {
        ADD_FAILURE() << "libsndfile cannot read " << path << ": " << sf_strerror(nullptr);
        return w;
    }
    w.rate = info.samplerate;
    w.channels = info.channels;
    w.samples.resize(static_cast<size_t>(info.frames) * info.channels);
    EXPECT_EQ(sf_readf_short(f, w.samples.data(), info.frames), info.frames);
    sf_close(f);
    return w;
}

double rms(const Wav& w, size_t first, size_t last) {
    last = std::min(last, w.frames());
    if (first >= last) return 0.0;
    double sum = 0;
    for (size_t i = first * w.channels; i < last * w.channels; ++i)
        sum += double(w.samples[i]) * w.samples[i];
    return std::sqrt(sum / double((last - first) * w.channels));
}

int peak(const Wav& w, size_t first, size_t last) {
    last = std::min(last, w.frames());
    int p = 0;
    for (size_t i = first * w.channels; i < last * w.channels; ++i)
        p = std::max(p, std::abs(int(w.samples[i])));
    return p;
}

}  // namespace kova_test
