// SPDX-License-Identifier: Apache-2.0
// Heap held by one instance, step by step as an application builds it: the Java init (instance
// record, its 960000-byte PCM buffer, the output stream with its ring buffer, the engine
// context), then a source set registered from three files, then one registered from a saved file.
#include <cstdint>
#include <string>
#include <vector>

#include "alloc_count.h"
#include "bench_files.h"
#include "bench_registry.h"
#include "jni/jni_entries.h"
#include "kova/kova_engine.h"
#include "kova/android/kova_registry.h"
#include "summary.h"
#include "util/kova_mem.h"

namespace kova_bench {
namespace {

struct Step {
    const char* what;
    long long bytes;
    unsigned long allocs;
};

class Meter {
   public:
    Meter() : heap_(heap_bytes_in_use()), allocs_(kova_mem_alloc_count()) {}
    Step read(const char* what) const {
        return Step{what,
                    static_cast<long long>(heap_bytes_in_use()) - static_cast<long long>(heap_),
                    kova_mem_alloc_count() - allocs_};
    }

   private:
    std::size_t heap_;
    unsigned long allocs_;
};

jlong java_init() {
    return Java_com_corvane_audio_Kova_init(nullptr, nullptr, 48000, 2, 1, 1080, 2280);
}

}  // namespace

void report_memory() {
    const char* const* paths = pcm_paths();
    const std::string saved = scratch_path("saved.kova");
    // Steps are kept here and printed at the end: writing them out as they come would grow the
    // report's own buffers inside the measured spans.
    std::vector<Step> steps;
    steps.reserve(8);

    // One instance made and destroyed first, so that what is allocated once per process (log
    // and stand-in set-up on first use) does not count as the instance's.
    const jlong warm = java_init();
    if (warm >= 1) Java_com_corvane_audio_Kova_deinit(nullptr, nullptr, warm);

    {
        // The engine context on its own, as a native caller of kova_init holds it.
        Meter m;
        KOVA_FORMAT fmt{48000, 2, 1, 1080, 2280};
        int32_t err = 0;
        KOVA_CTX* ctx = kova_init(&fmt, &err);
        steps.push_back(m.read("engine context alone (kova_init)"));
        kova_deinit(ctx);
    }

    Meter whole;
    const jlong id = java_init();
    if (id >= 1) {
        steps.push_back(
            whole.read("after init (instance, 960000-byte PCM buffer, output stream, context)"));
        KOVA_CTX* ctx = pKOVAInfo[id - 1].pInstance->pCtx;

        int32_t err = 0;
        Meter m_files;
        const int32_t set = kova_reg_src_byfiles(ctx, paths, &err);
        steps.push_back(m_files.read(set == 1
                                         ? "registering three files (38400 + 192000 + 38400 bytes)"
                                         : "registering three files FAILED"));

        // Saving returns the number of bytes written; the save itself is not measured.
        if (set == 1 && kova_save_source(ctx, 1, saved.c_str()) > 0) {
            Meter m_saved;
            const int32_t again = kova_reg_src_bysavefile(ctx, saved.c_str(), &err);
            steps.push_back(m_saved.read(again == 2 ? "registering the saved set from its file"
                                                    : "registering the saved set FAILED"));
        }
        steps.push_back(whole.read("whole instance with both sets"));
        Java_com_corvane_audio_Kova_deinit(nullptr, nullptr, id);
        steps.push_back(whole.read("left after deinit"));
    }

    preamble() << "\n### Heap per instance (bytes of live heap blocks, differences between steps)\n\n"
               << "| step | heap bytes | library allocations |\n|---|---|---|\n";
    if (id < 1) preamble() << "| instance creation failed | - | - |\n";
    for (const Step& s : steps) {
        preamble() << "| " << s.what << " | " << s.bytes << " | " << s.allocs << " |\n";
    }
}

}  // namespace kova_bench
