// SPDX-License-Identifier: Apache-2.0
// A fresh folder under the system's temporary directory, removed with its files: the one scratch
// folder helper of the test suites.
#ifndef KOVA_TESTS_SUPPORT_TEMP_DIR_H
#define KOVA_TESTS_SUPPORT_TEMP_DIR_H

#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <vector>

namespace kova_test {

// The bytes of the file at `path` (none when it cannot be read), as a string or a byte vector.
template <typename Bytes = std::string>
Bytes read_file(const std::string& path) {
    std::ifstream in(path, std::ios::binary);
    return Bytes(std::istreambuf_iterator<char>(in), std::istreambuf_iterator<char>());
}

struct TempDir {
    std::string path = [] {
        std::string t = std::filesystem::temp_directory_path() / "kova_XXXXXX";
        return std::string(mkdtemp(t.data()));
    }();
    TempDir() = default;
    ~TempDir() { std::filesystem::remove_all(path); }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    std::string file(const std::string& name) const { return path + "/" + name; }
    // Writes the elements' bytes to `name` and returns its path.
    template <typename T>
    std::string write(const std::string& name, const std::vector<T>& v) const {
        std::ofstream(file(name), std::ios::binary)
            .write(reinterpret_cast<const char*>(v.data()),
                   static_cast<std::streamsize>(v.size() * sizeof(T)));
        return file(name);
    }
};

}  // namespace kova_test

#endif
