#include "savefile_check.h"

#include <kova/kova_types.h>

#include <unistd.h>

#include "cli.h"
#include "input_file.h"

namespace kova_tool {
namespace {

/* Sets built by the engine hold one filter per type; a file may hold a few more, not thousands. */
constexpr int32_t kMaxFilters = 64;
constexpr int32_t kSlotMax[KOVA_SLOT_COUNT] = {KOVA_SLOT_START_MAX_BYTES, KOVA_SLOT_LOOP_MAX_BYTES,
                                               KOVA_SLOT_END_MAX_BYTES};

template <typename T>
bool read_at(const InputFile& in, int64_t pos, T& value) {
    return pread(in.fd(), &value, sizeof value, static_cast<off_t>(pos)) ==
           static_cast<ssize_t>(sizeof value);
}

}  // namespace

SavedFormat check_source_set_file(const std::string& path, bool need_loop) {
    const InputFile in(path, "source-set file");
    const int64_t size = in.size();
    auto reject = [&](const std::string& why) {
        failure(in_quotes(path) + " is not a source-set file (" + why + ")");
    };
    int32_t count = 0;
    if (size < 4 || !read_at(in, 0, count)) reject("shorter than 4 bytes");
    if (count < 0 || count > kMaxFilters)
        reject("filter count " + std::to_string(count) + " outside 0.." +
               std::to_string(kMaxFilters));
    const int64_t info_at = 4 + 40LL * count + static_cast<int64_t>(sizeof(KOVA_TUNE_SET));
    KOVA_SRC_INFO info{};
    if (!read_at(in, info_at, info)) reject("it ends before its slot table");
    int64_t pos = info_at + static_cast<int64_t>(sizeof info);
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
        if (info.has_src[s] != 1) continue;
        KOVA_SRC rec{};
        if (!read_at(in, pos, rec))
            reject("it ends inside the record of slot " + std::to_string(s));
        if (rec.size < 1 || rec.size > kSlotMax[s]) {
            reject("slot " + std::to_string(s) + " claims " + std::to_string(rec.size) +
                   " bytes, accepted 1.." + std::to_string(kSlotMax[s]));
        }
        pos += static_cast<int64_t>(sizeof rec) + rec.size;
        if (pos > size) reject("slot " + std::to_string(s) + " runs past the end of the file");
    }
    if (need_loop && info.has_src[KOVA_SLOT_LOOP] != 1) {
        failure(in_quotes(path) + " has no loop sound, so it cannot play a stroke");
    }
    return {info.samplerate, info.channels};
}

}  // namespace kova_tool
