// Heap held by one instance, step by step as an application builds it: the Java init (instance
// record, its 960000-byte PCM buffer, the output stream with its ring buffer, the engine
// context), then a source set registered from three files, then one registered from a saved file.
#include <jni.h>

#include <cstdint>
#include <string>

#include "alloc_count.h"
#include "bench_files.h"
#include "bench_registry.h"
#include "kova/kova_engine.h"
#include "kova/kova_registry.h"
#include "summary.h"
#include "util/kova_mem.h"

// The Java entry points of init and deinit use neither the JNI environment nor the class.
extern "C" {
jlong Java_com_corvane_audio_Kova_init(JNIEnv*, jclass, jint, jint, jint, jint, jint);
jint Java_com_corvane_audio_Kova_deinit(JNIEnv*, jclass, jlong);
}

namespace kova_bench {
namespace {

struct Step {
    long long bytes;
    unsigned long allocs;
};

class Meter {
   public:
    Meter() : heap_(heap_bytes_in_use()), allocs_(kova_mem_alloc_count()) {}
    Step read() const {
        return Step{static_cast<long long>(heap_bytes_in_use()) - static_cast<long long>(heap_),
                    kova_mem_alloc_count() - allocs_};
    }

   private:
    std::size_t heap_;
    unsigned long allocs_;
};

void row(const char* what, const Step& s) {
    preamble() << "| " << what << " | " << s.bytes << " | " << s.allocs << " |\n";
}

}  // namespace

void report_memory() {
    preamble() << "\n### Heap per instance (bytes in use on the heap, mallinfo2 deltas)\n\n"
               << "| step | heap bytes | library allocations |\n|---|---|---|\n";
    const char* const* paths = pcm_paths();
    {
        // The engine context on its own, as a native caller of kova_init holds it.
        Meter m;
        KOVA_FORMAT fmt{48000, 2, 1, 1080, 2280};
        int32_t err = 0;
        KOVA_CTX* ctx = kova_init(&fmt, &err);
        row("engine context alone (kova_init)", m.read());
        kova_deinit(ctx);
    }

    Meter whole;
    Meter m_init;
    const jlong id = Java_com_corvane_audio_Kova_init(nullptr, nullptr, 48000, 2, 1, 1080, 2280);
    if (id < 1) {
        preamble() << "| instance creation failed | - | - |\n";
        return;
    }
    row("after init (Java init: instance, PCM buffer, output stream, context)", m_init.read());
    KOVA_CTX* ctx = pKOVAInfo[id - 1].pInstance->pCtx;

    int32_t err = 0;
    Meter m_files;
    const int32_t set = kova_reg_src_byfiles(ctx, paths, &err);
    row("registering three files (38400 + 192000 + 38400 bytes)", m_files.read());

    const std::string saved = scratch_path("saved.kova");
    // Saving returns the number of bytes written.
    if (set != 1 || kova_save_source(ctx, 1, saved.c_str()) <= 0) {
        preamble() << "| saving the set failed | - | - |\n";
    } else {
        Meter m_saved;
        const int32_t again = kova_reg_src_bysavefile(ctx, saved.c_str(), &err);
        row(again == 2 ? "registering the saved set from its file"
                       : "registering the saved set FAILED",
            m_saved.read());
    }
    row("whole instance with both sets", whole.read());
    Java_com_corvane_audio_Kova_deinit(nullptr, nullptr, id);
    row("left after deinit", whole.read());
}

}  // namespace kova_bench
