// File-access layer: eight operations over a POSIX descriptor, reached only through a TARQ_MFAL
// filled by tarq_mfal_init.
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstring>

#include "kova/kova_source.h"
#include "source/source_io.h"
#include "util/kova_mem.h"

namespace {

// The handle is a heap cell holding one descriptor; -1 means "no descriptor".
int32_t* cell(void* h) {
    return static_cast<int32_t*>(h);
}

void* tarq_mfal_open(TARQ_MFAL* m, int mode) {
    if (m == nullptr || m->path == nullptr) return nullptr;
    auto* fd_cell = static_cast<int32_t*>(kova_mem_malloc(sizeof(int32_t)));
    if (fd_cell == nullptr) return nullptr;
    *fd_cell = -1;
    // Writing never truncates: a longer old file keeps its tail beyond the new data.
    // O_NONBLOCK: opening a FIFO would otherwise wait for its other end forever (and through Java
    // it would wait under the process-wide registry lock). Only regular files are used at all: a
    // FIFO, device, socket or directory is refused here, before anything is read or written.
    const int flags = O_NONBLOCK | O_NOCTTY | O_LARGEFILE | O_CLOEXEC;
    const int fd = (mode & 1) ? ::open(m->path, O_RDWR | O_CREAT | flags, 0644)
                              : ::open(m->path, O_RDONLY | flags);
    if (fd < 0) {
        kova_mem_free(fd_cell);
        return nullptr;
    }
    struct stat st {};
    if (::fstat(fd, &st) != 0 || !S_ISREG(st.st_mode) ||
        ::fcntl(fd, F_SETFL, ::fcntl(fd, F_GETFL) & ~O_NONBLOCK) != 0) {
        ::close(fd);
        kova_mem_free(fd_cell);
        return nullptr;
    }
    *fd_cell = fd;
    return fd_cell;
}

void tarq_mfal_close(void* h) {
    if (h == nullptr) return;
    if (*cell(h) != -1) ::close(*cell(h));
    kova_mem_free(h);
}

int tarq_mfal_read(void* h, void* buf, int len) {
    // A negative length would turn into a huge size_t count.
    if (h == nullptr || buf == nullptr || len < 0) return -1;
    return static_cast<int>(::read(*cell(h), buf, static_cast<size_t>(len)));
}

int tarq_mfal_write(void* h, const void* buf, int len) {
    if (h == nullptr || buf == nullptr || len < 0) return -1;
    return static_cast<int>(::write(*cell(h), buf, static_cast<size_t>(len)));
}

int tarq_mfal_getpos(void* h, int64_t* pos) {
    if (h == nullptr || pos == nullptr) return -1;
    const off64_t cur = ::lseek64(*cell(h), 0, SEEK_CUR);
    if (cur == -1) return -1;
    *pos = cur;
    return 0;
}

int tarq_mfal_setpos(void* h, const int64_t* pos) {
    if (h == nullptr || pos == nullptr) return -1;
    return ::lseek64(*cell(h), *pos, SEEK_SET) < 0 ? -1 : 0;
}

int tarq_mfal_skip(void* h, const int64_t* count) {
    if (h == nullptr || count == nullptr || *count < 1) return -1;
    const off64_t cur = ::lseek64(*cell(h), 0, SEEK_CUR);
    if (cur == -1) return -1;
    // Past INT64_MAX no offset exists; refuse instead of overflowing.
    if (*count > INT64_MAX - cur) return -1;
    return ::lseek64(*cell(h), cur + *count, SEEK_SET) < 0 ? -1 : 0;
}

int tarq_mfal_getsize(void* h, int64_t* size) {
    if (h == nullptr || size == nullptr) return -1;
    const int fd = *cell(h);
    const off64_t saved = ::lseek64(fd, 0, SEEK_CUR);
    if (saved == -1) return -1;
    if (::lseek64(fd, 0, SEEK_END) < 0) return -1;
    const off64_t end = ::lseek64(fd, 0, SEEK_CUR);
    if (end == -1) return -1;
    *size = end;
    return ::lseek64(fd, saved, SEEK_SET) < 0 ? -1 : 0;
}

}  // namespace

extern "C" KOVA_API int tarq_mfal_init(const char* path, TARQ_MFAL* mfal) {
    if (mfal == nullptr) return -1;
    *mfal = TARQ_MFAL{};
    mfal->open = tarq_mfal_open;
    mfal->close = tarq_mfal_close;
    mfal->read = tarq_mfal_read;
    mfal->write = tarq_mfal_write;
    mfal->getpos = tarq_mfal_getpos;
    mfal->setpos = tarq_mfal_setpos;
    mfal->skip = tarq_mfal_skip;
    mfal->getsize = tarq_mfal_getsize;
    mfal->path = static_cast<char*>(kova_mem_calloc(1, KOVA_PATH_BUF_BYTES));
    if (mfal->path == nullptr || path == nullptr) return -1;
    // strnlen never reads past the first KOVA_PATH_BUF_BYTES bytes of an overlong path.
    const size_t len = strnlen(path, KOVA_PATH_BUF_BYTES);
    if (len >= KOVA_PATH_BUF_BYTES) return -1;
    std::memcpy(mfal->path, path, len + 1);
    return 0;
}

namespace kova_source {

MfalFile::~MfalFile() {
    if (h_ != nullptr) m_.close(h_);
    kova_mem_free(m_.path);
}

bool MfalFile::open(const char* path, int mode) {
    if (h_ != nullptr || m_.path != nullptr) return false;  // one file per object
    if (tarq_mfal_init(path, &m_) != 0) return false;
    h_ = m_.open(&m_, mode);
    return h_ != nullptr;
}

}  // namespace kova_source
