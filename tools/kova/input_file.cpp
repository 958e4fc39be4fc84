#include "input_file.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstring>

#include "cli.h"

namespace kova_tool {
const char* file_kind(mode_t mode) {
    if (S_ISDIR(mode)) return "a folder";
    if (S_ISFIFO(mode)) return "a FIFO";
    if (S_ISCHR(mode) || S_ISBLK(mode)) return "a device";
    if (S_ISSOCK(mode)) return "a socket";
    return "not a file";
}

InputFile::InputFile(const std::string& path, const std::string& what) : path_(path), what_(what) {
    // O_NONBLOCK: opening a FIFO with no writer would otherwise wait for one.
    fd_ = open(path.c_str(), O_RDONLY | O_NONBLOCK | O_CLOEXEC);
    if (fd_ < 0) fail(std::strerror(errno));
    struct stat st {};
    if (fstat(fd_, &st) != 0) fail(std::strerror(errno));
    if (!S_ISREG(st.st_mode))
        fail(std::string("it is ") + file_kind(st.st_mode) + ", not a regular file");
    fcntl(fd_, F_SETFL, fcntl(fd_, F_GETFL) & ~O_NONBLOCK);
    size_ = st.st_size;
}

InputFile::~InputFile() {
    if (fd_ >= 0) close(fd_);
}

void InputFile::fail(const std::string& why) const {
    failure("cannot read " + what_ + " " + in_quotes(path_) + ": " + why);
}

std::string InputFile::read_all(int64_t max_bytes) const {
    if (size_ > max_bytes) {
        fail("it holds " + std::to_string(size_) + " bytes, more than the " +
             std::to_string(max_bytes) + " accepted");
    }
    return head(size_);
}

std::string InputFile::head(int64_t n) const {
    std::string data(static_cast<size_t>(std::min(n, size_)), '\0');
    size_t got = 0;
    while (got < data.size()) {
        const ssize_t n = pread(fd_, data.data() + got, data.size() - got, static_cast<off_t>(got));
        if (n < 0 && errno == EINTR) continue;
        if (n < 0) fail(std::strerror(errno));
        if (n == 0) break;  // the file shrank while it was read
        got += static_cast<size_t>(n);
    }
    data.resize(got);
    return data;
}

}  // namespace kova_tool
