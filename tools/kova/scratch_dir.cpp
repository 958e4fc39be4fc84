#include "scratch_dir.h"

#include <filesystem>
#include <fstream>
#include <random>

namespace kova_tool {

namespace fs = std::filesystem;

ScratchDir::~ScratchDir() {
    std::error_code ec;
    if (!path_.empty()) fs::remove_all(path_, ec);
}

std::string ScratchDir::write(const std::string& name, const std::vector<int16_t>& pcm) {
    std::error_code ec;
    if (path_.empty()) {
        const fs::path base = fs::temp_directory_path(ec);
        if (ec) return "";
        // create_directory reports whether it made the folder, so a name taken by someone else
        // is never shared.
        std::random_device rd;
        for (int attempt = 0; attempt < 16 && path_.empty(); ++attempt) {
            const fs::path p = base / ("kova-" + std::to_string(rd()));
            if (fs::create_directory(p, ec)) path_ = p.string();
        }
        if (path_.empty()) return "";
        fs::permissions(path_, fs::perms::owner_all, ec);
    }
    const std::string file = path_ + "/" + name;
    std::ofstream out(file, std::ios::binary | std::ios::trunc);
    out.write(reinterpret_cast<const char*>(pcm.data()),
              static_cast<std::streamsize>(pcm.size() * sizeof(int16_t)));
    out.close();
    return out ? file : "";
}

}  // namespace kova_tool
