/* A file that appears under its name only once it is complete: written to a temporary file in
 * the same folder and renamed over the target on commit. A failed or interrupted command leaves
 * an existing file of that name untouched and no partial file behind. A symbolic link is written
 * through: the file it points to is replaced, the link stays. A FIFO, device or folder is refused.
 * "-" is standard output: the temporary file is copied there on commit. */
#ifndef KOVA_TOOL_OUTPUT_FILE_H
#define KOVA_TOOL_OUTPUT_FILE_H

#include <string>

namespace kova_tool {

class OutputFile {
   public:
    /* Creates the temporary file at once, so a folder that cannot be written fails early. */
    explicit OutputFile(std::string path);
    ~OutputFile();
    OutputFile(const OutputFile&) = delete;
    OutputFile& operator=(const OutputFile&) = delete;

    /* As given on the command line, for messages. */
    const std::string& path() const { return path_; }
    const std::string& temp_path() const { return temp_; }
    /* The open temporary file (read-write, empty). */
    int fd() const { return fd_; }
    /* Closes and renames the temporary file over the target (or copies it to standard output). */
    void commit();

   private:
    std::string path_;
    std::string target_; /* where the data goes: the link's target for a symbolic link */
    std::string temp_;
    int fd_ = -1;
    bool committed_ = false;
};

}  // namespace kova_tool

#endif
