/* A file that appears under its name only once it is complete: written to a temporary file in
 * the same folder and renamed over the target on commit. A failed command leaves an existing file
 * of that name untouched and no partial file behind. */
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

    const std::string& path() const { return path_; }
    const std::string& temp_path() const { return temp_; }
    /* The open temporary file (read-write, empty). */
    int fd() const { return fd_; }
    /* Closes and renames the temporary file over the target. */
    void commit();

   private:
    std::string path_;
    std::string temp_;
    int fd_ = -1;
    bool committed_ = false;
};

}  // namespace kova_tool

#endif
