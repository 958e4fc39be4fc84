// SPDX-License-Identifier: Apache-2.0
// Registration by files, filter and saved file: identifiers, limits, defaults, failure paths.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <chrono>
#include <future>
#include <string>
#include <vector>

#include "engine/engine_fixture.h"
#include "kova/kova.h"

namespace {

using kova_test::set_of;

const KOVA_FLT_DSC kLowpass{KOVA_FLT_LOWPASS, 2000.0, 0.0, 1, 48000, 2};

/* Runs `call` on a thread and reports whether it returned within 5 s. A call that blocks in open
 * on `fifo` is then set free by opening the other end, so a regression fails instead of hanging. */
template <typename Call>
bool returns_promptly(Call call, const std::string& fifo) {
    std::future<void> done = std::async(std::launch::async, call);
    const bool prompt = done.wait_for(std::chrono::seconds(5)) == std::future_status::ready;
    while (done.wait_for(std::chrono::milliseconds(1)) != std::future_status::ready) {
        const int fd = open(fifo.c_str(), O_WRONLY | O_NONBLOCK);
        if (fd >= 0) close(fd);
    }
    return prompt;
}

}  // namespace

/* A FIFO, a directory and a device are no sound files: every path-taking call refuses them at
 * once with the code it gives for a missing file, and the context keeps its set. */
TEST(Registration, NonRegularFilesAreRefusedWithoutBlocking) {
    kova_test::TempDir dir;
    const std::string fifo = dir.file("fifo"), missing = dir.file("none");
    ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
    auto e = kova_test::make_ctx();
    const std::string loop = dir.write("l.pcm", kova_test::varied(4000));
    const char* good[3] = {nullptr, loop.c_str(), nullptr};
    int32_t err = 0;
    ASSERT_EQ(kova_reg_src_byfiles(e.get(), good, &err), 1);

    // Results, in order, of every call on `path`.
    auto results = [&](const std::string& path) {
        const char* p = path.c_str();
        const char* as_loop[3] = {loop.c_str(), p, nullptr};
        const char* as_start[3] = {p, loop.c_str(), nullptr};
        int32_t code = 1;
        int load_code = 1;
        char buf[64];
        int off[6] = {0};
        KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT] = {};
        KOVA_TUNE_SET tune{};
        KOVA_RPT_INFO info{};
        KOVA_SRC* src = kova_load_sound_source(p, KOVA_SLOT_LOOP, &load_code);
        const bool loaded = src != nullptr;
        kova_free_sourceobj(src);
        testing::internal::CaptureStdout();
        // A braced list evaluates in order, so each code is read right after its call.
        std::vector<int64_t> r = {
            kova_reg_src_byfiles(e.get(), as_loop, &code),
            code,
            kova_reg_src_bysavefile(e.get(), p, &code),
            code,
            kova_update_src_byfiles(e.get(), 1, as_start, &code),
            code,
            loaded,
            load_code,
            kova_read_source_file(p, buf, sizeof buf),
            kova_get_pcminfo_fromfile(p, &off[0], &off[1], &off[2], &off[3], &off[4], &off[5]),
            kova_get_filters_fromfile(p, flt),
            kova_get_tuneset_fromfile(p, &tune),
            kova_get_rptinfo_fromfile(p, &info)};
        testing::internal::GetCapturedStdout();
        if (path != missing) r.push_back(kova_save_source(e.get(), 1, p));
        return r;
    };
    std::vector<int64_t> expected = results(missing);
    expected.push_back(KOVA_ERR_SOURCE);  // saving
    EXPECT_EQ(expected[1], KOVA_ERR_SOURCE);  // the other codes for a missing file: contract table

    for (const std::string& path : {fifo, dir.path, std::string("/dev/zero")}) {
        std::vector<int64_t> got;
        EXPECT_TRUE(returns_promptly([&] { got = results(path); }, fifo)) << path;
        EXPECT_EQ(got, expected) << path;
    }
    EXPECT_EQ(kova_get_src_num(e.get()), 1);
    EXPECT_EQ(e.get()->active_src, 1);
    const KOVA_SRCSET* set = set_of(e.get(), 1);
    EXPECT_EQ(set->src[KOVA_SLOT_START], nullptr);
    EXPECT_EQ(set->src[KOVA_SLOT_LOOP]->size, 8000);
}

/* Identifiers count up from 1 over all three ways of registering, the newest set becomes the
 * active one, and the twenty-first (a saved file may take it) is the last. */
TEST(Registration, IdentifiersLimitsAndSelection) {
    kova_test::TempDir dir;
    auto e = kova_test::make_ctx();
    const std::string loop = dir.write("l.pcm", kova_test::varied(4000)), saved = dir.file("set");
    const char* paths[3] = {nullptr, loop.c_str(), nullptr};
    int32_t err = 0;
    EXPECT_EQ(kova_reg_src_byfiles(e.get(), paths, &err), 1);
    // Saved: count, tune set and slot table, then the loop's record and samples, nothing for the
    // empty slots; a folder that does not exist refuses (the path kinds above).
    ASSERT_EQ(kova_save_source(e.get(), 1, saved.c_str()), 112 + 48 + 8000);
    EXPECT_EQ(kova_save_source(e.get(), 1, dir.file("no/such").c_str()), KOVA_ERR_SOURCE);
    for (int i = 2; i <= 20; ++i) ASSERT_EQ(kova_reg_src_byfilter(e.get(), &kLowpass, &err), i);
    const auto full = [&](int32_t id) { return id == 0 && err == KOVA_ERR_SRC_FULL; };
    EXPECT_TRUE(full(kova_reg_src_byfiles(e.get(), paths, &err)));
    EXPECT_TRUE(full(kova_reg_src_byfilter(e.get(), &kLowpass, &err)));
    EXPECT_EQ(kova_reg_src_bysavefile(e.get(), saved.c_str(), &err), 21);
    EXPECT_TRUE(full(kova_reg_src_bysavefile(e.get(), saved.c_str(), &err)));
    EXPECT_EQ(e.get()->active_src, 21);

    // A thickness goes to the active set and the equaliser; selecting applies the set's own.
    KOVA_EQ ref;
    kova_eq_init(&ref, 880, 5000, 48000);
    kova_set_thickness(e.get(), 0.9);  // set 21 now has thickness 0.9, set 1 keeps 0.6
    EXPECT_EQ(e.get()->eq->low_gain, kova_eq_set_thickness(&ref, 0.9)->low_gain);
    EXPECT_EQ(kova_set_active_src(e.get(), 1), KOVA_OK);
    EXPECT_EQ(e.get()->eq->slew_decay, kova_eq_set_thickness(&ref, 0.6)->slew_decay);
    EXPECT_EQ(e.get()->active_src, 1);
}
