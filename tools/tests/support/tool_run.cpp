// SPDX-License-Identifier: Apache-2.0
#include "support/tool_run.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <sndfile.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cmath>
#include <csignal>
#include <ctime>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>

extern char** environ;

namespace kova_test {

namespace {

int64_t now_ms() {
    timespec t{};
    clock_gettime(CLOCK_MONOTONIC, &t);
    return t.tv_sec * 1000LL + t.tv_nsec / 1000000;
}

/* Waits for `pid`, sending SIGINT at `sigint_at` (monotonic ms, 0: never); returns the status and
 * the time from the signal to the exit. */
int wait_child(pid_t pid, int64_t sigint_at, int64_t& exit_ms) {
    int status = 0;
    int64_t sent = 0;
    while (waitpid(pid, &status, sigint_at ? WNOHANG : 0) == 0) {
        const int64_t now = now_ms();
        if (!sent && now >= sigint_at) kill(pid, SIGINT), sent = now;
        if (sent && now - sent > 10000) kill(pid, SIGKILL);
        usleep(5000);
    }
    if (sent) exit_ms = now_ms() - sent;
    return status;
}

/* Pointers to the strings, null-terminated, as exec takes them. */
std::vector<char*> c_strings(std::vector<std::string>& strings) {
    std::vector<char*> p;
    for (std::string& s : strings) p.push_back(s.data());
    p.push_back(nullptr);
    return p;
}

}  // namespace

RunResult run_kova(const std::vector<std::string>& args, const std::string& dir,
                   int sigint_after_ms, const std::vector<std::string>& env, bool stderr_tty) {
    const std::string out_path = dir + "/.stdout";
    const std::string err_path = dir + "/.stderr";
    std::vector<std::string> argv_store{KOVA_TOOL_BINARY};
    argv_store.insert(argv_store.end(), args.begin(), args.end());
    const std::vector<char*> argv = c_strings(argv_store);

    posix_spawn_file_actions_t fa;
    posix_spawn_file_actions_init(&fa);
    posix_spawn_file_actions_addopen(&fa, 0, "/dev/null", O_RDONLY, 0);
    posix_spawn_file_actions_addopen(&fa, 1, out_path.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0644);
    const int pty = stderr_tty ? posix_openpt(O_RDWR | O_NOCTTY) : -1;
    if (pty >= 0 && grantpt(pty) == 0 && unlockpt(pty) == 0) {
        posix_spawn_file_actions_addopen(&fa, 2, ptsname(pty), O_WRONLY | O_NOCTTY, 0);
    } else {
        posix_spawn_file_actions_addopen(&fa, 2, err_path.c_str(), O_WRONLY | O_CREAT | O_TRUNC,
                                         0644);
    }
    posix_spawn_file_actions_addchdir_np(&fa, dir.c_str());
    std::vector<std::string> env_store(env);
    for (char** e = environ; *e; ++e) env_store.emplace_back(*e);
    const std::vector<char*> envp = c_strings(env_store);
    pid_t pid = -1;
    RunResult r;
    const int64_t start = now_ms();
    const int rc = posix_spawn(&pid, argv[0], &fa, nullptr, argv.data(), envp.data());
    posix_spawn_file_actions_destroy(&fa);
    if (rc != 0) {
        ADD_FAILURE() << "cannot start " << argv[0];
        return r;
    }
    const int status = wait_child(pid, sigint_after_ms ? start + sigint_after_ms : 0, r.exit_ms);
    if (WIFEXITED(status)) r.code = WEXITSTATUS(status);
    r.out = read_file(out_path);
    r.err = read_file(err_path);
    // What the terminal got stays readable after the child closed its side.
    char buf[4096];
    for (ssize_t n; pty >= 0 && (n = read(pty, buf, sizeof buf)) > 0;) r.err.append(buf, n);
    if (pty >= 0) close(pty);
    unlink(out_path.c_str());
    unlink(err_path.c_str());
    return r;
}

std::string read_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(in), {}};
}

void write_file(const std::string& path, const std::string& bytes) {
    std::ofstream f(path, std::ios::binary | std::ios::trunc);
    f << bytes;
}

size_t count_files(const std::string& dir) {
    return static_cast<size_t>(std::distance(std::filesystem::directory_iterator(dir), {}));
}

bool has(const std::string& text, const std::string& part) {
    return text.find(part) != std::string::npos;
}

int count_lines(const std::string& text) {
    int n = 0;
    std::istringstream in(text);
    for (std::string line; std::getline(in, line);) n += !line.empty();
    return n;
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
