/* A private temporary folder for PCM that the engine must read from files (it registers sounds
 * from files only). Standard C++ only, so the browser build can use it too (emscripten's file
 * system is in memory). */
#ifndef KOVA_TOOL_SCRATCH_DIR_H
#define KOVA_TOOL_SCRATCH_DIR_H

#include <cstdint>
#include <string>
#include <vector>

namespace kova_tool {

class ScratchDir {
   public:
    ScratchDir() = default;
    /* Removes the folder and everything written into it. */
    ~ScratchDir();
    ScratchDir(const ScratchDir&) = delete;
    ScratchDir& operator=(const ScratchDir&) = delete;

    /* Writes `pcm` as raw 16-bit samples to a new file named `name`; returns its path, or an
     * empty string when the folder or file cannot be written. */
    std::string write(const std::string& name, const std::vector<int16_t>& pcm);

   private:
    std::string path_; /* created on the first write */
};

}  // namespace kova_tool

#endif
