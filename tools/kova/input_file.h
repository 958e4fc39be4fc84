/* Opening what the tool reads: regular files only, never blocking, whole reads bounded. */
#ifndef KOVA_TOOL_INPUT_FILE_H
#define KOVA_TOOL_INPUT_FILE_H

#include <sys/types.h>

#include <cstdint>
#include <string>

namespace kova_tool {

/* Owns a descriptor opened read-only on a regular file. A FIFO, device, socket or folder is
 * refused at once (opened without blocking, then checked), with one line naming `what` and
 * `path`: "cannot read gesture file 'x': it is a FIFO, not a regular file". */
/* "a FIFO", "a device", "a folder", ... for messages about a file that is not a regular one. */
const char* file_kind(mode_t mode);

class InputFile {
   public:
    InputFile(const std::string& path, const std::string& what);
    ~InputFile();
    InputFile(const InputFile&) = delete;
    InputFile& operator=(const InputFile&) = delete;

    int fd() const { return fd_; }
    int64_t size() const { return size_; }
    /* The whole file; a file larger than `max_bytes` fails with its size and the bound. */
    std::string read_all(int64_t max_bytes) const;
    /* The first `n` bytes, or the whole file when it is shorter. */
    std::string head(int64_t n) const;
    /* [[noreturn]] "cannot read <what> '<path>': <why>" */
    [[noreturn]] void fail(const std::string& why) const;

   private:
    std::string path_, what_;
    int fd_ = -1;
    int64_t size_ = 0;
};

}  // namespace kova_tool

#endif
