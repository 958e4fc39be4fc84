// SPDX-License-Identifier: Apache-2.0
// Registers a source set from an arbitrary source-set file (the input in the chunk language of
// file_script.h), plays a short stroke with it, saves it and registers the saved file again;
// then repeats the registration with an allocation failure injected somewhere along the way.
// One engine context serves every input (reset in between).
//
// Properties: no crash, leak or undefined behaviour; a registration either succeeds with
// identifier 1 and error 0 or fails with a documented code and registers nothing; every
// generation result is a whole byte count within the buffer; a saved set reads back to a set
// that saves to the very same bytes.
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "file_script.h"
#include "fuzz_support.h"
#include "util/kova_mem.h"

using namespace kova_fuzz;

namespace {

// A registration either gives identifier 1 and error 0 or fails with a documented code and
// registers nothing. Returns whether it succeeded.
bool registered(KOVA_CTX* ctx, const char* path) {
    int32_t err = 0;
    const int32_t id = kova_reg_src_bysavefile(ctx, path, &err);
    if (id == 0) {
        FUZZ_CHECK(err == KOVA_ERR_INVALID_PARAM || err == KOVA_ERR_INSUFF_MEM ||
                   err == KOVA_ERR_SOURCE);
        FUZZ_CHECK(kova_get_src_num(ctx) == 0);
    } else {
        FUZZ_CHECK(id == 1 && err == KOVA_OK && kova_get_src_num(ctx) == 1);
    }
    return id != 0;
}

void play_and_resave(KOVA_CTX* ctx, const ScratchFile& saved, const ScratchFile& resaved) {
    KOVA_TUNE_SET tune{};
    FUZZ_CHECK(kova_get_tuneset(ctx, 1, &tune) == KOVA_OK);
    KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT] = {};
    kova_get_filters(ctx, 1, flt);
    KOVA_RPT_INFO rpt{};
    kova_get_rptinfo(ctx, 1, &rpt);
    FUZZ_CHECK(kova_set_active_src(ctx, 1) == KOVA_OK);
    short_stroke(ctx);

    // A saved set, registered again, must save to the very same bytes.
    saved.remove();
    resaved.remove();
    FUZZ_CHECK(kova_save_source(ctx, 1, saved.path()) >= 0);
    int32_t err = 0;
    FUZZ_CHECK(kova_reg_src_bysavefile(ctx, saved.path(), &err) == 2 && err == KOVA_OK);
    FUZZ_CHECK(kova_save_source(ctx, 2, resaved.path()) >= 0);

    // Reading moves a file_gain of 0 or less (not NaN) to the stored wn_gain, which a saved set
    // always holds as 0.0: the one field a second reading may still change.
    KOVA_TUNE_SET expected = tune;
    if (!(expected.file_gain > 0.0) && !std::isnan(expected.file_gain)) expected.file_gain = 0.0;
    KOVA_TUNE_SET tune2{};
    FUZZ_CHECK(kova_get_tuneset(ctx, 2, &tune2) == KOVA_OK);
    FUZZ_CHECK(same_tune(tune2, expected));

    std::string first = saved.read();
    int32_t filters = 0;
    FUZZ_CHECK(first.size() >= sizeof filters);
    std::memcpy(&filters, first.data(), sizeof filters);
    FUZZ_CHECK(filters >= 0);  // a file may hold several descriptors of one type
    const size_t gain_at =
        4 + 40 * static_cast<size_t>(filters) + offsetof(KOVA_TUNE_SET, file_gain);
    FUZZ_CHECK(gain_at + sizeof(double) <= first.size());
    std::memcpy(&first[gain_at], &expected.file_gain, sizeof(double));
    FUZZ_CHECK(first == resaved.read());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    static const ScratchFile input("srcset-in");
    static const ScratchFile saved("srcset-saved");
    static const ScratchFile resaved("srcset-resaved");
    const std::vector<uint8_t> file = expand_file(data, size);
    input.rewrite(file.data(), file.size());
    {
        const ReusedCtx engine(kPhoneFormat);
        FUZZ_CHECK(engine.get() != nullptr);
        if (registered(engine.get(), input.path())) play_and_resave(engine.get(), saved, resaved);
    }
    // The same file with the n-th allocation failing (n taken from the input): a failure is
    // reported as such and leaves the context as it was.
    if (size > 0) {
        const ReusedCtx engine(kPhoneFormat);
        kova_mem_fail_after(static_cast<long>(data[size - 1] % 16));
        const bool ok = registered(engine.get(), input.path());
        kova_mem_fail_after(-1);
        if (ok) short_stroke(engine.get());
    }
    return 0;
}
