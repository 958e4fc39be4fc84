#include "output_file.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <cstdlib>
#include <vector>

#include "cli.h"

namespace kova_tool {

OutputFile::OutputFile(std::string path) : path_(std::move(path)) {
    if (path_.empty()) usage_error("an output file name is empty");
    struct stat st {};
    if (stat(path_.c_str(), &st) == 0 && S_ISDIR(st.st_mode)) {
        failure("cannot write " + quoted(path_) + ": it is a folder");
    }
    const size_t slash = path_.rfind('/');
    const std::string dir = slash == std::string::npos ? "" : path_.substr(0, slash + 1);
    const std::string base = slash == std::string::npos ? path_ : path_.substr(slash + 1);
    std::string tmpl = dir + "." + base + ".XXXXXX";
    std::vector<char> buf(tmpl.begin(), tmpl.end());
    buf.push_back('\0');
    fd_ = mkstemp(buf.data());
    if (fd_ < 0) failure("cannot write " + quoted(path_) + ": " + std::strerror(errno));
    temp_ = buf.data();
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
    if (fd_ >= 0) {
        const int rc = close(fd_);
        fd_ = -1;
        if (rc != 0) failure("cannot write " + quoted(path_) + ": " + std::strerror(errno));
    }
    if (rename(temp_.c_str(), path_.c_str()) != 0) {
        failure("cannot write " + quoted(path_) + ": " + std::strerror(errno));
    }
    committed_ = true;
}

}  // namespace kova_tool
