// SPDX-License-Identifier: Apache-2.0
// Helpers shared by the fuzz targets: a byte reader over the fuzz input, scratch files, a guarded
// output buffer and a checked stroke through kova_gen_sounds.
#ifndef KOVA_FUZZ_SUPPORT_H
#define KOVA_FUZZ_SUPPORT_H

#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include "kova/kova.h"

namespace kova_fuzz {

// A violated property: print what and where, then abort so the fuzzer records the input.
[[noreturn]] void fail(const char* what, const char* file, int line);
#define FUZZ_CHECK(cond)                                           \
    do {                                                           \
        if (!(cond)) ::kova_fuzz::fail(#cond, __FILE__, __LINE__); \
    } while (0)

// Consumes the fuzz input front to back; past the end every read yields zeros.
class Bytes {
   public:
    Bytes(const uint8_t* data, size_t size) : p_(data), left_(size) {}
    bool empty() const { return left_ == 0; }
    template <typename T>
    T take() {
        T value{};
        size_t got = 0;
        const uint8_t* at = span(sizeof(T), &got);
        std::memcpy(&value, at, got);  // the fuzz input is an image in machine byte order
        return value;
    }
    // Up to `n` bytes as a view; advances past them.
    const uint8_t* span(size_t n, size_t* got) {
        *got = n < left_ ? n : left_;
        const uint8_t* at = p_;
        p_ += *got;
        left_ -= *got;
        return at;
    }

   private:
    const uint8_t* p_;
    size_t left_;
};

// A file in the temporary directory (TMPDIR; the fuzz script points it at memory-backed storage),
// unique to this process and `tag`, removed when the object goes away. rewrite() replaces the
// whole content.
class ScratchFile {
   public:
    explicit ScratchFile(const char* tag)
        : path_(std::filesystem::temp_directory_path() /
                ("kova-fuzz-" + std::to_string(getpid()) + "-" + tag)) {}
    ~ScratchFile() { remove(); }
    ScratchFile(const ScratchFile&) = delete;
    ScratchFile& operator=(const ScratchFile&) = delete;
    void rewrite(const void* data, size_t size) const;
    void remove() const { unlink(path_.c_str()); }
    const char* path() const { return path_.c_str(); }
    // The current content (empty when the file does not exist).
    std::string read() const {
        std::ifstream in(path_, std::ios::binary);
        return {std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>()};
    }

   private:
    std::string path_;
};

// One generation call with every property an application relies on checked: the result is a
// whole, non-negative byte count that fits the buffer (of `buffer_bytes`, at most 1 MiB),
// nothing beyond the buffer is written and nothing is allocated. Returns the byte count.
int32_t checked_gen(KOVA_CTX* ctx, const KOVA_PARAM& ev, int32_t buffer_bytes);

// The usual engine format: 48000 Hz stereo with position panning on a 1080 x 2280 screen.
constexpr KOVA_FORMAT kPhoneFormat{48000, 2, 1, 1080, 2280};

// An engine context for one input, deinitialised (and checked to be) when it goes out of scope,
// so each execution frees what it allocated, as libFuzzer's leak check expects. get() is null
// for a format kova_init refuses; init_error() then holds its code.
class ScopedCtx {
   public:
    explicit ScopedCtx(const KOVA_FORMAT& f) { ctx_ = kova_init(&f, &err_); }
    ~ScopedCtx() {
        if (ctx_ != nullptr) FUZZ_CHECK(kova_deinit(ctx_) == KOVA_OK);
    }
    ScopedCtx(const ScopedCtx&) = delete;
    ScopedCtx& operator=(const ScopedCtx&) = delete;
    KOVA_CTX* get() const { return ctx_; }
    int32_t init_error() const { return err_; }

   private:
    KOVA_CTX* ctx_ = nullptr;
    int32_t err_ = KOVA_OK;
};

// A short stroke for the targets whose subject is a file, not generation (which the generation
// target covers): down, two moves 4 ms apart, up, with 256-byte buffers, each call checked.
// Enough to show that a set read from the file plays within its bounds.
void short_stroke(KOVA_CTX* ctx);

// Field-by-field bitwise equality of two tune sets; padding bytes (which a record read from a
// file may carry anything in) do not count.
bool same_tune(const KOVA_TUNE_SET& a, const KOVA_TUNE_SET& b);

}  // namespace kova_fuzz

#endif
