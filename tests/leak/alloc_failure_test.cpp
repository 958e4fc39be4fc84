// SPDX-License-Identifier: Apache-2.0
// Every operation that allocates, run with each of its allocations failing in turn, and whole
// lifecycles run many times over: a failure is reported with the documented code, leaves what
// existed intact, and gives back every byte. The heap in use is measured around each run (plain
// builds); under AddressSanitizer LeakSanitizer and under valgrind its leak check do the
// accounting. CI runs this binary under valgrind --leak-check=full. The live bytes come from the
// benchmarks' counting malloc, which the sanitizer builds leave out.
#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <string>
#include <thread>

#include "alloc_count.h"
#include "jni/jni_test_support.h"
#include "kova/kova.h"
#include "util/kova_mem.h"

namespace {

using namespace std::chrono_literals;
constexpr int kMem = KOVA_ERR_INSUFF_MEM;
const KOVA_FORMAT kPhone{48000, 2, 1, 1080, 2280};
const KOVA_FLT_DSC kLowpass{KOVA_FLT_LOWPASS, 2000.0, 1.0, 1, 48000, 2};
const KOVA_FLT_DSC kBandpass{KOVA_FLT_BANDPASS, 1200.0, 0.7, 1, 48000, 2};
const std::vector<int> kMemOrParam = {kMem, KOVA_ERR_INVALID_PARAM};
const std::vector<int> kAnyError = {kMem, KOVA_ERR_SOURCE, KOVA_ERR_INVALID_PARAM};

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
size_t live() {  // 0 where the sanitizers' malloc keeps the books
    return kova_bench::alloc_counting_enabled() ? kova_bench::heap_bytes_in_use() : 0;
}
void settle(size_t heap) {
    for (int i = 0; i < 500 && live() != heap; ++i) std::this_thread::sleep_for(1ms);
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
        const size_t heap = live();
        const unsigned long before = kova_mem_alloc_count();
        run(n);
        settle(heap);
        EXPECT_EQ(live(), heap) << "bytes not given back";
        if (kova_mem_alloc_count() - before <= static_cast<unsigned long>(n)) {
            EXPECT_GE(n, op.min_allocs);
            return;
        }
    }
    ADD_FAILURE() << op.what << ": more than 500 allocations";
}

// Whether `v` is one of the documented failure `codes`; anything else fails the test.
bool one_of(int v, const std::vector<int>& codes) {
    if (std::find(codes.begin(), codes.end(), v) != codes.end()) return true;
    ADD_FAILURE() << "undocumented result " << v;
    return false;
}

// A constructor run with allocation n failing: what it made releases cleanly; when it made
// nothing, it failed, with one of `codes` in `*err` (read afterwards) where it reports one.
template <typename Make, typename Release>
std::function<bool(long)> made(Make make, Release release, const int32_t* err = nullptr,
                               std::vector<int> codes = {}) {
    return [=](long n) {
        auto* p = failing_at(n, make);
        if (p == nullptr) return err == nullptr || one_of(*err, codes);
        if constexpr (std::is_void_v<decltype(release(p))>) {
            release(p);
        } else {
            EXPECT_EQ(release(p), KOVA_OK);
        }
        return false;
    };
}

class AllocFailure : public testing::Test {
   protected:
    void SetUp() override {
        saved_ = snd_.dir.file("set.kss");
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
        if (ctx != nullptr && (kova_reg_src_byfiles(ctx, snd_.path, &err) != 1 ||
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

    jni_test::Sounds snd_{4000, 20000, 3000};
    std::string saved_;
};

TEST_F(AllocFailure, EveryOperationReportsReleasesAndKeepsWhatExisted) {
    const char* const* paths = snd_.path;
    int32_t err = 0;
    const std::string out = saved_ + ".out";
    const KOVA_FLT_DSC highpass{KOVA_FLT_HIGHPASS, 150.0, 1.0, 1, 48000, 2};
    // A registration on a context that already plays a set: set 2, or a failure that adds nothing.
    auto reg = [&](auto call, const std::vector<int>& codes = kAnyError) {
        return [&, call](long n) {
            return on_engine(n, [&](KOVA_CTX* ctx) {
                const int32_t id = call(ctx);
                EXPECT_EQ(kova_get_src_num(ctx), id == 0 ? 1 : 2);
                EXPECT_TRUE(id == 0 || (id == 2 && err == KOVA_OK)) << id << ", " << err;
                return id == 0 && one_of(err, codes);
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
        {"kova_init", made([&] { return kova_init(&kPhone, &err); }, kova_deinit, &err, {kMem}),
         "KOVA_CTX malloc fail \nkova_init() fail. err code (-2) \n", 8},
        {"register files", reg([&](KOVA_CTX* c) { return kova_reg_src_byfiles(c, paths, &err); })},
        {"register filter",
         reg([&](KOVA_CTX* c) { return kova_reg_src_byfilter(c, &kLowpass, &err); })},
        {"register saved file",
         reg([&](KOVA_CTX* c) { return kova_reg_src_bysavefile(c, saved_.c_str(), &err); },
             kMemOrParam)},
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
         made([&] { return kova_flt_init(&kBandpass, &err); }, kova_flt_deinit, &err, {kMem}),
         "KOVA_CTX malloc fail \nkova_flt_init() fail. err code (-2) \n", 7},
        {"oscillator", made([] { return kova_osc_init(48000, 2, 0); }, kova_osc_deinit),
         "KOVA_CTX malloc fail \nkova_osc_init() fail. err code (KOVA_ERR_INSUFF_MEM) \n"},
        {"noise source",
         made([&] { return kova_gen_sound_source_wn(&kLowpass, 1, &err); }, kova_free_sourceobj,
              &err, {kMem}),
         "kova_gen_sound_source() fail.", 3},
        {"Java instance",
         [&](long n) {
             const jlong id = failing_at(n, [&] { return jni_test::init_default(); });
             if (id >= 1) {  // its whole life: a set registered, a start sound played, teardown
                 EXPECT_EQ(jni_test::reg(id, snd_), 1);
                 JAVA(start_1fasttrack, id);
                 EXPECT_EQ(JAVA(gen_1tofasttrack, id, 10, 10, 5, 0, 0), 4000);
                 EXPECT_EQ(jni_test::deinit(id), 0);  // while playing
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

}  // namespace
