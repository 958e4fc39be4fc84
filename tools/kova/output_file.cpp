#include "output_file.h"

#include <stdlib.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <fstream>
#include <iterator>
#include <vector>

#include "cli.h"
#include "input_file.h"

namespace kova_tool {
namespace {

bool to_stdout(const std::string& path) {
    return path == "-";
}

}  // namespace

OutputFile::OutputFile(std::string path) : path_(std::move(path)), target_(path_) {
    if (path_.empty()) usage_error("an output file name is empty");
    const auto fail = [&](const std::string& why) {
        failure("cannot write " + in_quotes(path_) + ": " + why);
    };
    std::string dir;
    if (to_stdout(path_)) {
        data_on_stdout();
        const char* tmp = std::getenv("TMPDIR");
        dir = std::string(tmp && *tmp ? tmp : "/tmp") + "/";
    } else {
        struct stat st {};
        if (lstat(path_.c_str(), &st) == 0 && S_ISLNK(st.st_mode)) {
            // Written through: the data replaces the file the link points to.
            char* real = realpath(path_.c_str(), nullptr);
            if (!real) fail("it is a symbolic link to nothing that exists");
            target_ = real;
            free(real);
        }
        if (stat(target_.c_str(), &st) == 0 && !S_ISREG(st.st_mode)) {
            fail(std::string("it is ") + file_kind(st.st_mode) + ", not a regular file" +
                 (S_ISFIFO(st.st_mode) ? " (use -o - for a pipe)" : ""));
        }
        const size_t slash = target_.rfind('/');
        dir = slash == std::string::npos ? "" : target_.substr(0, slash + 1);
    }
    const std::string base =
        to_stdout(path_) ? "kova-stdout" : target_.substr(target_.rfind('/') + 1);
    std::string tmpl = dir + "." + base + ".XXXXXX";
    fd_ = mkstemp(tmpl.data());
    if (fd_ < 0) fail(std::strerror(errno));
    temp_ = tmpl;
    // mkstemp creates the file for its owner only; the result gets the usual permissions.
    const mode_t mask = umask(0);
    umask(mask);
    fchmod(fd_, 0666 & ~mask);
}

OutputFile::~OutputFile() {
    if (fd_ >= 0) close(fd_);
    if (!committed_ && !temp_.empty()) unlink(temp_.c_str());
}

void OutputFile::commit() {
    const auto fail = [&](const std::string& why) {
        failure("cannot write " + in_quotes(path_) + ": " + why);
    };
    if (to_stdout(path_)) {
        // By name: the library may have written the file through a descriptor of its own.
        std::ifstream in(temp_, std::ios::binary);
        const std::string data{std::istreambuf_iterator<char>(in), {}};
        if (!in.good() && !in.eof()) fail(std::strerror(errno));
        if (std::fwrite(data.data(), 1, data.size(), out()) != data.size() || std::fflush(out()))
            fail(std::strerror(errno));
        return;  // the destructor removes the temporary file
    }
    if (fd_ >= 0) {
        const int rc = close(fd_);
        fd_ = -1;
        if (rc != 0) fail(std::strerror(errno));
    }
    if (rename(temp_.c_str(), target_.c_str()) != 0) fail(std::strerror(errno));
    committed_ = true;
}

}  // namespace kova_tool
