// SPDX-License-Identifier: Apache-2.0
// Every operation that allocates, run with each of its allocations failing in turn, and whole
// lifecycles run many times over: a failure is reported with the documented code, leaves what
// existed intact, and gives back every byte. The heap in use is measured around each run (plain
// builds); under AddressSanitizer LeakSanitizer and under valgrind its leak check do the
// accounting. CI runs this binary under valgrind --leak-check=full.
#include <gtest/gtest.h>
#include <malloc.h>

#include <atomic>
#include <cerrno>

#include <cstring>
#include <functional>
#include <string>

#include "jni/jni_test_support.h"
#include "kova/kova.h"
#include "kova/android/kova_fasttrack.h"
#include "util/kova_mem.h"

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define KOVA_SANITIZED_HEAP 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define KOVA_SANITIZED_HEAP 1
#endif
#endif

#ifndef KOVA_SANITIZED_HEAP
// Plain builds: this binary's own malloc family counts the bytes that are live, process-wide and
// exactly (the allocator's statistics count freed blocks held in per-thread caches as used).
// Each call forwards to the C library's allocator.
extern "C" {
void* __libc_malloc(size_t);
void* __libc_calloc(size_t, size_t);
void* __libc_realloc(void*, size_t);
void* __libc_memalign(size_t, size_t);
void* __libc_valloc(size_t);
void* __libc_pvalloc(size_t);
void __libc_free(void*);
}

namespace {
std::atomic<long long> g_live_bytes{0};
void* counted(void* p) {
    if (p != nullptr) g_live_bytes += static_cast<long long>(malloc_usable_size(p));
    return p;
}
}  // namespace

extern "C" {
void* malloc(size_t n) {
    return counted(__libc_malloc(n));
}
void* calloc(size_t n, size_t size) {
    return counted(__libc_calloc(n, size));
}
void free(void* p) {
    if (p != nullptr) g_live_bytes -= static_cast<long long>(malloc_usable_size(p));
    __libc_free(p);
}
void* realloc(void* p, size_t n) {
    const long long old = p != nullptr ? static_cast<long long>(malloc_usable_size(p)) : 0;
    void* q = __libc_realloc(p, n);
    if (q != nullptr || n == 0) g_live_bytes -= old;  // moved, resized or freed
    return counted(q);
}
void* memalign(size_t align, size_t n) {
    return counted(__libc_memalign(align, n));
}
void* aligned_alloc(size_t align, size_t n) {
    return counted(__libc_memalign(align, n));
}
int posix_memalign(void** out, size_t align, size_t n) {
    void* p = counted(__libc_memalign(align, n));
    if (p == nullptr) return ENOMEM;
    *out = p;
    return 0;
}
void* valloc(size_t n) {
    return counted(__libc_valloc(n));
}
void* pvalloc(size_t n) {
    return counted(__libc_pvalloc(n));
}
}
#endif

namespace {

#ifdef KOVA_SANITIZED_HEAP
constexpr bool kHeapMeasurable = false;  // the sanitizer's allocator keeps its own books
long long heap_in_use() {
    return 0;
}
#else
constexpr bool kHeapMeasurable = true;
long long heap_in_use() {
    return g_live_bytes.load();
}
#endif

const KOVA_FORMAT kPhone{48000, 2, 1, 1080, 2280};
const KOVA_FLT_DSC kLowpass{KOVA_FLT_LOWPASS, 2000.0, 1.0, 1, 48000, 2};
const KOVA_FLT_DSC kBandpass{KOVA_FLT_BANDPASS, 1200.0, 0.7, 1, 48000, 2};

// Runs `attempt` with allocation n failing, for n = 0, 1, ..., until a run never reached its
// n-th allocation. `attempt` gets whether that failure was met (it may be swallowed, e.g. by a
// slot left empty) and checks and undoes its own effects. Returns the number of allocations
// the operation makes when nothing fails.
int sweep(const char* what, const std::function<void(long n)>& attempt) {
    const auto run = [&](long n) {
        testing::internal::CaptureStdout();  // the engine's diagnostic lines
        attempt(n);
        testing::internal::GetCapturedStdout();
    };
    run(-1);  // warm-up: one-time allocations of the C library, the log and the capture
    for (long n = 0; n < 500; ++n) {
        SCOPED_TRACE(std::string(what) + ", allocation " + std::to_string(n) + " failing");
        const long long heap = heap_in_use();
        const unsigned long before = kova_mem_alloc_count();
        run(n);
        const unsigned long made = kova_mem_alloc_count() - before;
        if (kHeapMeasurable) {
            EXPECT_EQ(heap_in_use(), heap) << "bytes not given back";
        }
        if (made <= static_cast<unsigned long>(n)) return static_cast<int>(n);
    }
    ADD_FAILURE() << what << ": more than 500 allocations";
    return 0;
}

// Runs `call` with the n-th allocation failing (n < 0: none fails).
template <typename F>
auto failing_at(long n, F call) {
    kova_mem_fail_after(n);
    auto result = call();
    kova_mem_fail_after(-1);
    return result;
}

class AllocFailure : public testing::Test {
   protected:
    void SetUp() override {
        start_ = files_.write("start.pcm", 4000, 700.0);
        loop_ = files_.write("loop.pcm", 20000, 300.0);
        end_ = files_.write("end.pcm", 3000, 500.0);
        saved_ = start_ + ".kss";
        // A set with two filters and all three slots, saved once as the file to read back.
        KOVA_CTX* ctx = engine_with_set();
        ASSERT_NE(ctx, nullptr);
        ASSERT_GT(kova_save_source(ctx, 1, saved_.c_str()), 0);
        kova_deinit(ctx);
    }

    // A context holding one registered set (files + two filters), or null.
    KOVA_CTX* engine_with_set() {
        int32_t err = 0;
        KOVA_CTX* ctx = kova_init(&kPhone, &err);
        if (ctx == nullptr) return nullptr;
        const char* paths[3] = {start_.c_str(), loop_.c_str(), end_.c_str()};
        if (kova_reg_src_byfiles(ctx, paths, &err) != 1 ||
            kova_attach_filter(ctx, 1, &kLowpass, &err) != 1 ||
            kova_attach_filter(ctx, 1, &kBandpass, &err) != 1) {
            kova_deinit(ctx);
            return nullptr;
        }
        return ctx;
    }

    // A start event on the active set still plays the start sound.
    static void expect_playable(KOVA_CTX* ctx) {
        std::vector<int16_t> out(48000);
        KOVA_PCMBUF buf{out.data(), static_cast<int32_t>(out.size() * 2)};
        const KOVA_PARAM down{100.0f, 100.0f, 10, 0.0f, KOVA_ACTION_START};
        EXPECT_EQ(kova_gen_sounds(ctx, &down, &buf), 4000);
    }

    jni_test::PcmFiles files_;
    std::string start_, loop_, end_, saved_;
};

TEST_F(AllocFailure, EngineLifecycleAndRegistrations) {
    EXPECT_GT(sweep("kova_init",
                    [](long n) {
                        int32_t err = 0;
                        KOVA_CTX* ctx = failing_at(n, [&] { return kova_init(&kPhone, &err); });
                        if (ctx == nullptr) {
                            EXPECT_EQ(err, KOVA_ERR_INSUFF_MEM);
                        } else {
                            EXPECT_EQ(err, KOVA_OK);
                            EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
                        }
                    }),
              5);

    // Each registration on a context that already plays a set: a failure adds nothing and the
    // first set still plays; a registration that got through has its loop.
    enum Way { kFiles, kFilter, kSaveFile };
    for (Way way : {kFiles, kFilter, kSaveFile}) {
        sweep("registration", [&](long n) {
            KOVA_CTX* ctx = engine_with_set();
            ASSERT_NE(ctx, nullptr);
            const char* paths[3] = {start_.c_str(), loop_.c_str(), end_.c_str()};
            int32_t err = 0;
            const int32_t id = failing_at(n, [&] {
                return way == kFiles    ? kova_reg_src_byfiles(ctx, paths, &err)
                       : way == kFilter ? kova_reg_src_byfilter(ctx, &kLowpass, &err)
                                        : kova_reg_src_bysavefile(ctx, saved_.c_str(), &err);
            });
            if (id == 0) {
                EXPECT_TRUE(err == KOVA_ERR_INSUFF_MEM || err == KOVA_ERR_SOURCE ||
                            err == KOVA_ERR_INVALID_PARAM)
                    << err;
                EXPECT_EQ(kova_get_src_num(ctx), 1);
                EXPECT_EQ(ctx->active_src, 1);
            } else {
                EXPECT_EQ(id, 2);
                EXPECT_EQ(err, KOVA_OK);
                KOVA_RPT_INFO info{};
                EXPECT_EQ(kova_get_rptinfo(ctx, 2, &info), KOVA_OK);
                EXPECT_GT(info.len_ms[KOVA_SLOT_LOOP], 0);
                ASSERT_EQ(kova_set_active_src(ctx, 1), KOVA_OK);
            }
            expect_playable(ctx);
            EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
        });
    }
}

TEST_F(AllocFailure, EditingAndSavingASet) {
    enum Op { kUpdate, kAttach, kReplaceFiles, kSave };
    for (Op op : {kUpdate, kAttach, kReplaceFiles, kSave}) {
        sweep("set edit", [&](long n) {
            KOVA_CTX* ctx = engine_with_set();
            ASSERT_NE(ctx, nullptr);
            const std::string out = saved_ + ".out";
            std::remove(out.c_str());
            const char* paths[3] = {start_.c_str(), loop_.c_str(), nullptr};
            KOVA_FLT_DSC narrower = kBandpass;
            narrower.bandwidth = 0.3;
            KOVA_FLT_DSC highpass{KOVA_FLT_HIGHPASS, 150.0, 1.0, 1, 48000, 2};
            int32_t err = 0;
            const int32_t rc = failing_at(n, [&] {
                switch (op) {
                    case kUpdate:
                        return kova_update_filter(ctx, 1, &narrower, &err);
                    case kAttach:
                        return kova_attach_filter(ctx, 1, &highpass, &err);
                    case kReplaceFiles:
                        return kova_update_src_byfiles(ctx, 1, paths, &err);
                    case kSave:
                        return kova_save_source(ctx, 1, out.c_str());
                }
                return 0;
            });
            // Whatever an edit lost, the set stays registered and generation stays in bounds.
            EXPECT_EQ(kova_get_src_num(ctx), 1);
            if (op == kSave) {
                EXPECT_TRUE(rc > 0 || rc == KOVA_ERR_SOURCE || rc == KOVA_ERR_INVALID_PARAM) << rc;
            } else if (rc == 0) {
                EXPECT_TRUE(err == KOVA_ERR_INSUFF_MEM || err == KOVA_ERR_SOURCE ||
                            err == KOVA_ERR_INVALID_PARAM)
                    << err;
            } else {
                EXPECT_EQ(rc, 1);
            }
            std::vector<int16_t> buf(48000);
            KOVA_PCMBUF pcm{buf.data(), static_cast<int32_t>(buf.size() * 2)};
            const KOVA_PARAM down{100.0f, 100.0f, 10, 0.0f, KOVA_ACTION_START};
            const int32_t bytes = kova_gen_sounds(ctx, &down, &pcm);
            EXPECT_TRUE(bytes == 0 || bytes == 4000) << bytes;
            EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
            std::remove(out.c_str());
        });
    }
}

TEST_F(AllocFailure, FileReadingAndQueries) {
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        sweep("kova_load_sound_source", [&](long n) {
            int err = 0;
            KOVA_SRC* src =
                failing_at(n, [&] { return kova_load_sound_source(loop_.c_str(), slot, &err); });
            if (src == nullptr) {
                EXPECT_TRUE(err == KOVA_ERR_INSUFF_MEM || err == KOVA_ERR_SOURCE) << err;
            } else {
                EXPECT_EQ(err, KOVA_OK);
                EXPECT_EQ(src->size, 20000);
                kova_free_sourceobj(src);
            }
        });
    }
    sweep("kova_read_source_file", [&](long n) {
        char buf[64];
        const int got = failing_at(n, [&] { return kova_read_source_file(end_.c_str(), buf, 64); });
        EXPECT_TRUE(got == 64 || got == 0) << got;
    });
    sweep("kova_open_source", [&](long n) {
        KOVA_SRCSET set{};
        set.filters = list_create();
        set.tune = static_cast<KOVA_TUNE_SET*>(kova_mem_calloc(1, sizeof(KOVA_TUNE_SET)));
        ASSERT_NE(set.filters, nullptr);
        ASSERT_NE(set.tune, nullptr);
        const int rc = failing_at(n, [&] { return kova_open_source(&set, saved_.c_str()); });
        if (rc == KOVA_OK) {
            EXPECT_EQ(set.filters->count, 2u);
        } else {
            EXPECT_TRUE(rc == KOVA_ERR_INSUFF_MEM || rc == KOVA_ERR_INVALID_PARAM) << rc;
        }
        // The caller frees a set that failed half-way, as registration does.
        auto* owned = static_cast<KOVA_SRCSET*>(kova_mem_calloc(1, sizeof(KOVA_SRCSET)));
        ASSERT_NE(owned, nullptr);
        *owned = set;
        kova_free_sourceset(owned);
    });
    sweep("file queries", [&](long n) {
        int off[3] = {-1, -1, -1}, size[3] = {-1, -1, -1};
        KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT] = {};
        KOVA_TUNE_SET tune{};
        KOVA_RPT_INFO rpt{};
        const int rc[4] = {
            failing_at(n,
                       [&] {
                           return kova_get_pcminfo_fromfile(saved_.c_str(), &off[0], &size[0],
                                                            &off[1], &size[1], &off[2], &size[2]);
                       }),
            failing_at(n, [&] { return kova_get_filters_fromfile(saved_.c_str(), flt); }),
            failing_at(n, [&] { return kova_get_tuneset_fromfile(saved_.c_str(), &tune); }),
            failing_at(n, [&] { return kova_get_rptinfo_fromfile(saved_.c_str(), &rpt); }),
        };
        for (int r : rc)
            EXPECT_TRUE(r == KOVA_OK || r == KOVA_ERR_INSUFF_MEM || r == KOVA_ERR_INVALID_PARAM)
                << r;
        if (rc[0] == KOVA_OK) {
            EXPECT_EQ(size[KOVA_SLOT_LOOP], 20000);
        }
    });
}

TEST_F(AllocFailure, JavaInstancesAndStreams) {
    JNIEnv* env = fake_jni::env();
    ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
    EXPECT_GT(sweep("Java init",
                    [&](long n) {
                        const jlong id = failing_at(n, [&] {
                            return Java_com_corvane_audio_Kova_init(env, nullptr, 48000, 2, 1, 1080,
                                                                    2280);
                        });
                        // The registry lock outlives a failed init and goes with a deinit; the
                        // load hook brings it back so every run ends with one lock, as it began.
                        if (id < 1) {
                            EXPECT_TRUE(id == 0 || id == -1) << id;
                            for (const KovaInfo& slot : pKOVAInfo) EXPECT_EQ(slot.isUsed, 0);
                            EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
                            return;
                        }
                        fake_jni::String s[3] = {{start_}, {loop_}, {end_}};
                        EXPECT_EQ(Java_com_corvane_audio_Kova_reg_1src_1byfiles(
                                      env, nullptr, id, fake_jni::jstr(s[0]), fake_jni::jstr(s[1]),
                                      fake_jni::jstr(s[2])),
                                  1);
                        Java_com_corvane_audio_Kova_start_1fasttrack(env, nullptr, id);
                        EXPECT_EQ(Java_com_corvane_audio_Kova_gen_1tofasttrack(
                                      env, nullptr, id, 10.0f, 10.0f, 5, 0.0f, KOVA_ACTION_START),
                                  4000);
                        Java_com_corvane_audio_Kova_stop_1fasttrack(env, nullptr, id);
                        EXPECT_EQ(Java_com_corvane_audio_Kova_deinit(env, nullptr, id), 0);
                        EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
                    }),
              3);
    sweep("kova_open_fasttrack", [](long n) {
        KOVA_FASTTRACK* ft = failing_at(n, [] { return kova_open_fasttrack(48000, 2); });
        kova_close_fasttrack(ft, 1);
    });
}

// Many whole lifecycles in a row: whatever one leaves behind adds up.
TEST_F(AllocFailure, RepeatedLifecyclesGiveEverythingBack) {
    JNIEnv* env = fake_jni::env();
    ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
    fake_jni::String s[3] = {{start_}, {loop_}, {end_}};
    auto cycle = [&] {
        const jlong a = Java_com_corvane_audio_Kova_init(env, nullptr, 48000, 2, 1, 1080, 2280);
        const jlong b = Java_com_corvane_audio_Kova_init(env, nullptr, 16000, 1, 0, 720, 1280);
        ASSERT_GE(a, 1);
        ASSERT_GE(b, 1);
        for (jlong id : {a, b}) {
            EXPECT_EQ(Java_com_corvane_audio_Kova_reg_1src_1byfiles(
                          env, nullptr, id, fake_jni::jstr(s[0]), fake_jni::jstr(s[1]),
                          fake_jni::jstr(s[2])),
                      1);
            Java_com_corvane_audio_Kova_start_1fasttrack(env, nullptr, id);
            Java_com_corvane_audio_Kova_gen_1tofasttrack(env, nullptr, id, 5.0f, 5.0f, 1, 0.0f,
                                                         KOVA_ACTION_START);
        }
        KOVA_CTX* ctx = engine_with_set();
        ASSERT_NE(ctx, nullptr);
        int32_t err = 0;
        EXPECT_EQ(kova_reg_src_bysavefile(ctx, saved_.c_str(), &err), 2);
        EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
        EXPECT_EQ(Java_com_corvane_audio_Kova_deinit(env, nullptr, b), 0);  // still playing
        EXPECT_EQ(Java_com_corvane_audio_Kova_deinit(env, nullptr, a), 0);
    };
    cycle();  // warm-up
    const long long heap = heap_in_use();
    for (int i = 0; i < 30; ++i) cycle();
    if (kHeapMeasurable) {
        EXPECT_EQ(heap_in_use(), heap);
    }
}

}  // namespace
