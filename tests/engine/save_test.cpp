// SPDX-License-Identifier: Apache-2.0
// Saving a set through the engine: the byte count of a set with only a loop, and the documented
// refusals, which write nothing. The saved bytes themselves, and what the engine makes of them
// when they are registered again, are checked against an independently encoded image by the
// cross-machine source-set test; the file layer's open mode and path limit by its own tests.
#include <gtest/gtest.h>

#include <filesystem>
#include <string>

#include "engine/engine_fixture.h"
#include "kova/kova.h"

TEST(SaveSource, SavesPresentSlotsOnlyAndRefusesWithoutWriting) {
    kova_test::TempDir dir;
    const kova_test::CtxPtr owner = kova_test::make_ctx();
    KOVA_CTX* ctx = owner.get();
    const KOVA_FLT_DSC low{KOVA_FLT_LOWPASS, 2000.0, 0.0, 1, 48000, 2};
    int32_t err = 0;
    ASSERT_EQ(kova_reg_src_byfilter(ctx, &low, &err), 1);
    // Count, one descriptor, tune set and slot table, then the loop's record and samples.
    const std::string ok = dir.file("ok.kova");
    EXPECT_EQ(kova_save_source(ctx, 1, ok.c_str()), 112 + 40 + 48 + 192000);
    EXPECT_EQ(std::filesystem::file_size(ok), 112u + 40 + 48 + 192000);

    EXPECT_EQ(kova_save_source(ctx, 1, dir.file("no/such.kova").c_str()), KOVA_ERR_SOURCE);
    EXPECT_EQ(kova_save_source(ctx, 1, dir.path.c_str()), KOVA_ERR_SOURCE);  // a directory
}
