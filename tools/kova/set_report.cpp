#include <kova/kova_source.h>

#include <cstring>
#include <memory>
#include <nlohmann/json.hpp>

#include "commands.h"
#include "options.h"
#include "savefile_check.h"

namespace kova_tool {
namespace {

constexpr uint32_t kAbsentType = 0xFFFFFFFFu;

struct FileInfo {
    int offset[KOVA_SLOT_COUNT] = {-1, -1, -1};
    int size[KOVA_SLOT_COUNT] = {-1, -1, -1};
    KOVA_FLT_DSC filters[KOVA_FLT_TYPE_COUNT]{};
    KOVA_TUNE_SET tune{};
    KOVA_RPT_INFO repeat{};

    bool present(int slot) const { return size[slot] >= 0; }
    bool has_filter(uint32_t type) const { return filters[type].type == type; }
};

FileInfo query(const std::string& path) {
    FileInfo info;
    // The queries copy each descriptor into the element of its type and leave the others alone;
    // a type code no descriptor has marks the untouched ones.
    for (KOVA_FLT_DSC& f : info.filters) f.type = kAbsentType;
    auto check = [&](int rc, const char* what) {
        if (rc != KOVA_OK)
            failure("cannot read the " + std::string(what) + " of " + in_quotes(path) +
                    " (library code " + std::to_string(rc) + ")");
    };
    check(kova_get_pcminfo_fromfile(path.c_str(), &info.offset[0], &info.size[0], &info.offset[1],
                                    &info.size[1], &info.offset[2], &info.size[2]),
          "payloads");
    check(kova_get_filters_fromfile(path.c_str(), info.filters), "filters");
    check(kova_get_tuneset_fromfile(path.c_str(), &info.tune), "tune set");
    check(kova_get_rptinfo_fromfile(path.c_str(), &info.repeat), "repeat points");
    return info;
}

/* Not-a-number values (possible in a file) dump as null, as JSON has no NaN. */
nlohmann::ordered_json tune_json(const KOVA_TUNE_SET& t) {
    return {{"gain", t.gain},
            {"pan", t.pan},
            {"osc_enable", t.osc_enable},
            {"osc_depth", t.osc_depth},
            {"sharp_enable", t.sharp_enable},
            {"sharpness", t.sharpness},
            {"wn_gain", t.wn_gain},
            {"file_gain", t.file_gain},
            {"start_gain", t.start_gain},
            {"loop_gain", t.loop_gain},
            {"end_gain", t.end_gain}};
}

void print_text(const std::string& path, const FileInfo& in) {
    std::FILE* f = out();
    std::fprintf(f, "source-set file %s\n\nslots:\n", path.c_str());
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
        if (!in.present(s)) {
            std::fprintf(f, "  %-5s  (empty)\n", slot_name(s));
            continue;
        }
        std::fprintf(f, "  %-5s  offset %7d  size %6d bytes  length %5lld ms  repeat %d..%d ms\n",
                     slot_name(s), in.offset[s], in.size[s],
                     static_cast<long long>(in.repeat.len_ms[s]), in.repeat.rpt_start_ms[s],
                     in.repeat.rpt_end_ms[s]);
    }
    std::fprintf(f, "\nfilters:\n");
    bool any = false;
    for (uint32_t t = 0; t < KOVA_FLT_TYPE_COUNT; ++t) {
        if (!in.has_filter(t)) continue;
        const KOVA_FLT_DSC& d = in.filters[t];
        any = true;
        std::fprintf(f, "  %-10s  freq %s Hz  bandwidth %s Hz  %s  (for %d Hz, %d channel%s)\n",
                     filter_type_name(t), num(d.freq).c_str(), num(d.bandwidth).c_str(),
                     d.enable == 1 ? "on " : "off", d.samplerate, d.channels,
                     d.channels == 1 ? "" : "s");
    }
    if (!any) std::fprintf(f, "  (none)\n");
    std::fprintf(f, "\ntune set:\n");
    const nlohmann::ordered_json tune = tune_json(in.tune);
    for (const auto& [name, value] : tune.items())
        std::fprintf(f, "  %-12s %s\n", name.c_str(), value.dump().c_str());
}

void print_json(const std::string& path, const FileInfo& in) {
    nlohmann::ordered_json slots, filters = nlohmann::json::array();
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
        nlohmann::ordered_json& j = slots[slot_name(s)];
        j["present"] = in.present(s);
        if (!in.present(s)) continue;
        j["offset"] = in.offset[s];
        j["size"] = in.size[s];
        j["length_ms"] = in.repeat.len_ms[s];
        j["repeat_start_ms"] = in.repeat.rpt_start_ms[s];
        j["repeat_end_ms"] = in.repeat.rpt_end_ms[s];
    }
    for (uint32_t t = 0; t < KOVA_FLT_TYPE_COUNT; ++t) {
        if (!in.has_filter(t)) continue;
        const KOVA_FLT_DSC& d = in.filters[t];
        filters.push_back({{"type", filter_type_name(t)},
                           {"type_code", t},
                           {"freq", d.freq},
                           {"bandwidth", d.bandwidth},
                           {"enable", d.enable},
                           {"samplerate", d.samplerate},
                           {"channels", d.channels}});
    }
    const nlohmann::ordered_json j = {
        {"file", path}, {"slots", slots}, {"filters", filters}, {"tune", tune_json(in.tune)}};
    std::fprintf(out(), "%s\n", j.dump(2).c_str());
}

struct InspectOptions {
    std::string path;
    bool json = false;
};

int run_inspect(const InspectOptions& o) {
    check_source_set_file(o.path, false);
    const FileInfo info = query(o.path);
    std::fflush(stdout);
    if (o.json) {
        print_json(o.path, info);
    } else {
        print_text(o.path, info);
    }
    return kExitOk;
}

}  // namespace

Run add_inspect(CLI::App& app) {
    auto o = std::make_shared<InspectOptions>();
    CLI::App* sub =
        app.add_subcommand("inspect", "show what a saved source-set file holds (--json for JSON)");
    sub->add_option("file", o->path, "the source-set file")->required()->type_name("FILE");
    sub->add_flag("--json", o->json, "print the same as one JSON object");
    return [o] { return run_inspect(*o); };
}

}  // namespace kova_tool
