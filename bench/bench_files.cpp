// SPDX-License-Identifier: Apache-2.0
#include "bench_files.h"

#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <stdexcept>
#include <vector>

#include "bench_signal.h"
#include "kova/kova_types.h"

namespace kova_bench {
namespace {

struct Files {
    std::string dir;
    std::string paths[KOVA_SLOT_COUNT];
    const char* c_paths[KOVA_SLOT_COUNT];
    std::vector<std::string> extra;

    Files() {
        char tmpl[] = "/tmp/kova-bench-XXXXXX";
        if (mkdtemp(tmpl) == nullptr) throw std::runtime_error("cannot create a temporary dir");
        dir = tmpl;
        const char* names[KOVA_SLOT_COUNT] = {"start.pcm", "loop.pcm", "end.pcm"};
        const int bytes[KOVA_SLOT_COUNT] = {KOVA_SLOT_START_MAX_BYTES, KOVA_SLOT_LOOP_MAX_BYTES,
                                            KOVA_SLOT_END_MAX_BYTES};
        for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
            paths[s] = dir + "/" + names[s];
            const std::vector<int16_t> pcm = noise_pcm(bytes[s] / 2, 100 + s);
            FILE* f = std::fopen(paths[s].c_str(), "wb");
            if (f == nullptr || std::fwrite(pcm.data(), 2, pcm.size(), f) != pcm.size()) {
                throw std::runtime_error("cannot write " + paths[s]);
            }
            std::fclose(f);
            c_paths[s] = paths[s].c_str();
        }
    }
    ~Files() {
        for (const std::string& p : paths) unlink(p.c_str());
        for (const std::string& p : extra) unlink(p.c_str());
        rmdir(dir.c_str());
    }
};

Files& files() {
    static Files f;
    return f;
}

}  // namespace

const char* const* pcm_paths() {
    return files().c_paths;
}

std::string scratch_path(const char* name) {
    Files& f = files();
    f.extra.push_back(f.dir + "/" + name);
    return f.extra.back();
}

}  // namespace kova_bench
