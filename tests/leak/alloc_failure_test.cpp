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
#include <functional>
#include <string>
#include <thread>

#include "jni/jni_test_support.h"
#include "kova/kova.h"
#include "kova/android/kova_fasttrack.h"
#include "kova_host/audio_sink.h"
#include "util/kova_mem.h"

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
#define KOVA_SANITIZED_HEAP 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer) || __has_feature(thread_sanitizer)
#define KOVA_SANITIZED_HEAP 1
#endif
#endif

namespace {
// Live bytes; stays 0 under the sanitizers, whose allocators keep their own books.
std::atomic<long long> g_live_bytes{0};
}  // namespace

#ifndef KOVA_SANITIZED_HEAP
// Plain builds: this binary's own malloc family counts the bytes that are live, process-wide and
// exactly (the allocator's statistics count freed blocks held in per-thread caches as used).
// Each call forwards to the C library's allocator.
extern "C" {
void* __libc_malloc(size_t);
void* __libc_calloc(size_t, size_t);
void* __libc_realloc(void*, size_t);
void* __libc_memalign(size_t, size_t);
void __libc_free(void*);
}

namespace {
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
}
#endif

namespace {

using namespace std::chrono_literals;
const KOVA_FORMAT kPhone{48000, 2, 1, 1080, 2280};
const KOVA_FLT_DSC kLowpass{KOVA_FLT_LOWPASS, 2000.0, 1.0, 1, 48000, 2};
const KOVA_FLT_DSC kBandpass{KOVA_FLT_BANDPASS, 1200.0, 0.7, 1, 48000, 2};
const std::initializer_list<int> kMemOrParam = {KOVA_ERR_INSUFF_MEM, KOVA_ERR_INVALID_PARAM};
const std::initializer_list<int> kAnyError = {KOVA_ERR_INSUFF_MEM, KOVA_ERR_SOURCE,
                                              KOVA_ERR_INVALID_PARAM};

// One allocating operation, run with allocation n failing by `attempt(n)`, which checks that the
// result is success or a documented failure, that what existed is intact, and undoes its own
// effects; it returns whether the operation failed. A failed run's standard output must end with
// `printed`; with nothing failing, the operation makes at least `min_allocs` allocations.
struct Op {
    const char* what;
    std::function<bool(long n)> attempt;
    std::string printed = "";
    long min_allocs = 1;
};

// Runs `call` with the n-th allocation failing (n < 0: none fails).
template <typename F>
auto failing_at(long n, F call) {
    kova_mem_fail_after(n);
    auto result = call();
    kova_mem_fail_after(-1);
    return result;
}

// A device thread slow to end (on a loaded machine) frees its state only after the close: waits a
// little for the live bytes to come back to `heap`.
void settle(long long heap) {
    for (int i = 0; i < 500 && g_live_bytes != heap; ++i) std::this_thread::sleep_for(1ms);
}

// Sweeps n = 0, 1, ... until a run never reached its n-th allocation; each run must give back
// every byte.
void sweep(const Op& op) {
    const auto run = [&](long n) {
        testing::internal::CaptureStdout();  // the library's diagnostic lines
        const bool failed = op.attempt(n);
        const std::string out = testing::internal::GetCapturedStdout();
        if (testing::Test::HasFailure()) std::fputs(out.c_str(), stderr);  // gtest's lines too
        if (failed && n >= 0) {
            EXPECT_TRUE(
                out.size() >= op.printed.size() &&
                out.compare(out.size() - op.printed.size(), std::string::npos, op.printed) == 0)
                << out;
        }
    };
    run(-1);  // warm-up: one-time allocations of the C library, the log and the capture
    for (long n = 0; n < 500; ++n) {
        SCOPED_TRACE(std::string(op.what) + ", allocation " + std::to_string(n) + " failing");
        const long long heap = g_live_bytes.load();
        const unsigned long before = kova_mem_alloc_count();
        run(n);
        settle(heap);
        EXPECT_EQ(g_live_bytes.load(), heap) << "bytes not given back";
        if (kova_mem_alloc_count() - before <= static_cast<unsigned long>(n)) {
            EXPECT_GE(n, op.min_allocs);
            return;
        }
    }
    ADD_FAILURE() << op.what << ": more than 500 allocations";
}

// Whether `v` is one of the documented failure `codes`; anything else fails the test.
bool one_of(int v, std::initializer_list<int> codes) {
    for (int c : codes) {
        if (v == c) return true;
    }
    ADD_FAILURE() << "undocumented result " << v;
    return false;
}

// A constructor's result: released when it was made (false), else whether `err` (read after the
// constructor ran) holds a documented code.
template <typename T, typename Release>
bool made_or(T* made, Release release, const int32_t& err, std::initializer_list<int> codes) {
    if (made != nullptr) return release(made) != KOVA_OK;
    return one_of(err, codes);
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
        ASSERT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
    }

    // A context holding one registered set (files + two filters), or null.
    KOVA_CTX* engine_with_set() {
        int32_t err = 0;
        KOVA_CTX* ctx = kova_init(&kPhone, &err);
        const char* paths[3] = {start_.c_str(), loop_.c_str(), end_.c_str()};
        if (ctx != nullptr && (kova_reg_src_byfiles(ctx, paths, &err) != 1 ||
                               kova_attach_filter(ctx, 1, &kLowpass, &err) != 1 ||
                               kova_attach_filter(ctx, 1, &kBandpass, &err) != 1)) {
            kova_deinit(ctx);
            return nullptr;
        }
        return ctx;
    }

    // Runs `edit` with allocation n failing on a context with one set; whatever an edit lost,
    // the set stays registered and its start sound plays whole or not at all.
    template <typename Edit>
    bool on_engine(long n, Edit edit) {
        KOVA_CTX* ctx = engine_with_set();
        EXPECT_NE(ctx, nullptr);
        if (ctx == nullptr) return false;
        const bool failed = failing_at(n, [&] { return edit(ctx); });
        EXPECT_GE(kova_get_src_num(ctx), 1);
        EXPECT_EQ(kova_set_active_src(ctx, 1), KOVA_OK);
        std::vector<int16_t> out(48000);
        KOVA_PCMBUF buf{out.data(), static_cast<int32_t>(out.size() * 2)};
        const KOVA_PARAM down{100.0f, 100.0f, 10, 0.0f, KOVA_ACTION_START};
        const int32_t bytes = kova_gen_sounds(ctx, &down, &buf);
        EXPECT_TRUE(bytes == 4000 || bytes == 0) << bytes;
        EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
        return failed;
    }

    // A Java instance's whole life: registration, a start event played, teardown.
    void java_instance(jlong id) {
        JNIEnv* env = fake_jni::env();
        EXPECT_EQ(Java_com_corvane_audio_Kova_reg_1src_1byfiles(
                      env, nullptr, id, fake_jni::jstr(s_[0]), fake_jni::jstr(s_[1]),
                      fake_jni::jstr(s_[2])),
                  1);
        Java_com_corvane_audio_Kova_start_1fasttrack(env, nullptr, id);
        EXPECT_EQ(Java_com_corvane_audio_Kova_gen_1tofasttrack(env, nullptr, id, 10, 10, 5, 0, 0),
                  4000);
    }

    jni_test::PcmFiles files_;
    std::string start_, loop_, end_, saved_;
    fake_jni::String s_[3];
};

TEST_F(AllocFailure, EveryOperationReportsReleasesAndKeepsWhatExisted) {
    const char* paths[3] = {start_.c_str(), loop_.c_str(), end_.c_str()};
    int32_t err = 0;
    const std::string out = saved_ + ".out";
    const KOVA_FLT_DSC highpass{KOVA_FLT_HIGHPASS, 150.0, 1.0, 1, 48000, 2};
    KOVA_FLT_DSC narrower = kBandpass;
    narrower.bandwidth = 0.3;
    s_[0].utf = start_, s_[1].utf = loop_, s_[2].utf = end_;
    // A registration on a context that already plays a set: set 2, or a failure that adds nothing.
    auto reg = [&](auto call) {
        return [&, call](long n) {
            return on_engine(n, [&](KOVA_CTX* ctx) {
                const int32_t id = call(ctx);
                EXPECT_EQ(kova_get_src_num(ctx), id == 0 ? 1 : 2);
                EXPECT_TRUE(id == 0 || (id == 2 && err == KOVA_OK)) << id << ", " << err;
                return id == 0 && one_of(err, kAnyError);
            });
        };
    };
    // An edit of set 1: 1, or a failure with a documented code.
    auto edit = [&](auto call) {
        return [&, call](long n) {
            return on_engine(
                n, [&](KOVA_CTX* ctx) { return call(ctx) != 1 && one_of(err, kAnyError); });
        };
    };
    const Op ops[] = {
        {"kova_init",
         [&](long n) {
             return made_or(failing_at(n, [&] { return kova_init(&kPhone, &err); }), kova_deinit,
                            err, {KOVA_ERR_INSUFF_MEM});
         },
         "KOVA_CTX malloc fail \nkova_init() fail. err code (-2) \n", 8},
        {"register files", reg([&](KOVA_CTX* c) { return kova_reg_src_byfiles(c, paths, &err); })},
        {"register filter",
         reg([&](KOVA_CTX* c) { return kova_reg_src_byfilter(c, &kLowpass, &err); })},
        {"register saved file",
         reg([&](KOVA_CTX* c) { return kova_reg_src_bysavefile(c, saved_.c_str(), &err); })},
        {"update filter",
         edit([&](KOVA_CTX* c) { return kova_update_filter(c, 1, &narrower, &err); })},
        {"attach filter",
         edit([&](KOVA_CTX* c) { return kova_attach_filter(c, 1, &highpass, &err); })},
        {"replace files", edit([&](KOVA_CTX* c) {
             const char* two[3] = {paths[0], paths[1], nullptr};
             return kova_update_src_byfiles(c, 1, two, &err);
         })},
        {"save",
         [&](long n) {
             return on_engine(n, [&](KOVA_CTX* ctx) {
                 const int rc = kova_save_source(ctx, 1, out.c_str());
                 std::remove(out.c_str());
                 return rc <= 0 && one_of(rc, {KOVA_ERR_SOURCE, KOVA_ERR_INVALID_PARAM});
             });
         }},
        {"load sound source",
         [&](long n) {
             return made_or(
                 failing_at(n, [&] { return kova_load_sound_source(loop_.c_str(), 1, &err); }),
                 [](KOVA_SRC* src) {
                     EXPECT_EQ(src->size, 20000);
                     return kova_free_sourceobj(src), KOVA_OK;
                 },
                 err, {KOVA_ERR_INSUFF_MEM, KOVA_ERR_SOURCE});
         }},
        {"read source file",
         [&](long n) {
             char buf[64];
             const int got =
                 failing_at(n, [&] { return kova_read_source_file(end_.c_str(), buf, 64); });
             return got != 64 && one_of(got, {0});
         }},
        {"open saved set",
         [&](long n) {
             KOVA_SRCSET* set = static_cast<KOVA_SRCSET*>(kova_mem_calloc(1, sizeof(KOVA_SRCSET)));
             set->filters = list_create();
             set->tune = static_cast<KOVA_TUNE_SET*>(kova_mem_calloc(1, sizeof(KOVA_TUNE_SET)));
             const int rc = failing_at(n, [&] { return kova_open_source(set, saved_.c_str()); });
             EXPECT_TRUE(rc != KOVA_OK || set->filters->count == 2u);
             kova_free_sourceset(set);  // the caller frees a set that failed half-way
             return rc != KOVA_OK && one_of(rc, kMemOrParam);
         }},
        {"file queries",
         [&](long n) {
             int o[6];
             KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT];
             KOVA_TUNE_SET tune;
             KOVA_RPT_INFO rpt;
             const char* p = saved_.c_str();
             const std::function<int()> queries[] = {
                 [&] { return kova_get_pcminfo_fromfile(p, o, o + 1, o + 2, o + 3, o + 4, o + 5); },
                 [&] { return kova_get_filters_fromfile(p, flt); },
                 [&] { return kova_get_tuneset_fromfile(p, &tune); },
                 [&] { return kova_get_rptinfo_fromfile(p, &rpt); }};
             bool failed = false;
             for (const auto& query : queries) {
                 const int rc = failing_at(n, query);
                 failed |= rc != KOVA_OK && one_of(rc, kMemOrParam);
             }
             return failed;
         }},
        {"filter",
         [&](long n) {
             return made_or(failing_at(n, [&] { return kova_flt_init(&kBandpass, &err); }),
                            kova_flt_deinit, err, {KOVA_ERR_INSUFF_MEM});
         },
         "KOVA_CTX malloc fail \nkova_flt_init() fail. err code (-2) \n", 7},
        {"oscillator",
         [&](long n) {
             KOVA_OSC* osc = failing_at(n, [&] { return kova_osc_init(48000, 2, 0); });
             return osc == nullptr || kova_osc_deinit(osc) != KOVA_OK;
         },
         "KOVA_CTX malloc fail \nkova_osc_init() fail. err code (KOVA_ERR_INSUFF_MEM) \n"},
        {"noise source",
         [&](long n) {
             return made_or(
                 failing_at(n, [&] { return kova_gen_sound_source_wn(&kLowpass, 1, &err); }),
                 [](KOVA_SRC* src) { return kova_free_sourceobj(src), KOVA_OK; }, err,
                 {KOVA_ERR_INSUFF_MEM});
         },
         "kova_gen_sound_source() fail.", 3},
        {"ring buffer",
         [&](long n) {
             KOVA_RINGBUFFER* rb = failing_at(n, [] { return kova_ringbuffer_create(64); });
             kova_ringbuffer_free(rb);
             return rb == nullptr;
         },
         "", 2},
        {"file access",
         [&](long n) {
             TARQ_MFAL m{};
             if (failing_at(n, [&] { return tarq_mfal_init(end_.c_str(), &m); }) != 0) return true;
             kova_mem_free(m.path);
             return false;
         }},
        {"list",
         [&](long n) {
             LIST* l = failing_at(n, [] { return list_create(); });
             if (l == nullptr) return true;
             int a = 1, b = 2;
             list_pushback(l, &a);
             const bool failed =
                 failing_at(n, [&] { return insert_after(l, l->head, &b); }) == nullptr;
             EXPECT_EQ(l->count, failed ? 1u : 2u);
             EXPECT_EQ(list_getat(l, failed ? 0 : 1)->data, &a);
             list_destory(l, [](void*) {});  // the elements live on the stack
             return failed;
         },
         "", 3},
        {"fast-track stream",
         [&](long n) {
             KOVA_FASTTRACK* ft = failing_at(n, [] { return kova_open_fasttrack(48000, 2); });
             kova_close_fasttrack(ft, 1);
             return ft == nullptr;
         },
         "", 4},
        {"Java instance",
         [&](long n) {
             const jlong id = failing_at(n, [&] { return jni_test::init_default(); });
             if (id >= 1) {
                 java_instance(id);
                 EXPECT_EQ(jni_test::deinit(id), 0);
             }
             for (const KovaInfo& slot : pKOVAInfo) EXPECT_EQ(slot.isUsed, 0);
             // A deinit takes the registry lock with it; the load hook brings it back so every
             // run ends with one lock, as it began.
             EXPECT_EQ(JNI_OnLoad(fake_jni::vm(), nullptr), JNI_VERSION_1_6);
             return id < 1 && one_of(static_cast<int>(id), {0, -1});
         },
         "", 3},
    };
    for (const Op& op : ops) sweep(op);
}

// Many whole lifecycles in a row: whatever one leaves behind adds up.
TEST_F(AllocFailure, RepeatedLifecyclesGiveEverythingBack) {
    JNIEnv* env = fake_jni::env();
    s_[0].utf = start_, s_[1].utf = loop_, s_[2].utf = end_;
    auto cycle = [&] {
        const jlong a = Java_com_corvane_audio_Kova_init(env, nullptr, 48000, 2, 1, 1080, 2280);
        const jlong b = Java_com_corvane_audio_Kova_init(env, nullptr, 16000, 1, 0, 720, 1280);
        ASSERT_GE(a, 1);
        ASSERT_GE(b, 1);
        java_instance(a);
        java_instance(b);
        KOVA_CTX* ctx = engine_with_set();
        ASSERT_NE(ctx, nullptr);
        int32_t err = 0;
        EXPECT_EQ(kova_reg_src_bysavefile(ctx, saved_.c_str(), &err), 2);
        EXPECT_EQ(kova_deinit(ctx), KOVA_OK);
        EXPECT_EQ(Java_com_corvane_audio_Kova_deinit(env, nullptr, b), 0);  // still playing
        EXPECT_EQ(Java_com_corvane_audio_Kova_deinit(env, nullptr, a), 0);
    };
    cycle();  // warm-up
    EXPECT_TRUE(jni_test::wait_for([] { return kova_host_lingering_tracks() == 0; }));
    const long long heap = g_live_bytes.load();
    for (int i = 0; i < 30; ++i) cycle();
    settle(heap);
    EXPECT_EQ(g_live_bytes.load(), heap);
}

}  // namespace
