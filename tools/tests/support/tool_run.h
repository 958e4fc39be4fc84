// SPDX-License-Identifier: Apache-2.0
/* Running the kova binary from tests, and reading back what it wrote. */
#ifndef KOVA_TOOL_TESTS_TOOL_RUN_H
#define KOVA_TOOL_TESTS_TOOL_RUN_H

#include <cstdint>
#include <string>
#include <vector>

#include "support/temp_dir.h"

namespace kova_test {

struct RunResult {
    int code = -1; /* exit code; -1 when the process did not exit normally */
    std::string out;
    std::string err;
    int64_t exit_ms = -1; /* from the signal to the exit, when a signal was sent */
};

/* Runs the kova binary with `args` in `dir`, standard input closed, with `env` ("NAME=value")
 * added to the environment. With `sigint_after_ms`, sends SIGINT that long after the start (and
 * SIGKILL 10 s later should it still run). With `stderr_tty`, standard error is a terminal. */
RunResult run_kova(const std::vector<std::string>& args, const std::string& dir,
                   int sigint_after_ms = 0, const std::vector<std::string>& env = {},
                   bool stderr_tty = false);

void write_file(const std::string& path, const std::string& bytes);
/* Files in the folder, hidden ones included. */
size_t count_files(const std::string& dir);
bool has(const std::string& text, const std::string& part);
/* CSV rows of a stroke: down at `t0` at (100, y), a move every 10 ms up to `last_ms`, straight on
 * at 1 px/ms and then up, or to and fro by 10 px and never lifted. */
std::string stroke_csv(int t0, int last_ms, int y, bool to_and_fro = false);

struct Wav {
    int rate = 0;
    int channels = 0;
    std::vector<int16_t> samples; /* interleaved */
    size_t frames() const { return channels ? samples.size() / channels : 0; }
};

/* Writes `seconds` of a 440 Hz tone at 0.1 of full scale with libsndfile in `format`. */
void write_tone(const std::string& path, int format, int rate, int channels, double seconds);
/* Reads a WAV file with libsndfile; a file it cannot open fails the calling test. */
Wav read_wav(const std::string& path);
/* Root mean square of all channels together over frames [first, last). */
double rms(const Wav& w, size_t first, size_t last);
/* Largest absolute sample over frames [first, last). */
int peak(const Wav& w, size_t first, size_t last);

}  // namespace kova_test

#endif
