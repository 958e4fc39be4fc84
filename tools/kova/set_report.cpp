#include <kova/kova_source.h>

#include <cstring>

#include "commands.h"
#include "json.h"
#include "options.h"
#include "savefile_check.h"

namespace kova_tool {
namespace {

const char* const kHelp =
    "Usage: kova inspect [--json] FILE\n"
    "Shows what the library's file queries read from a saved source-set file: where each slot's\n"
    "sound lies in the file and how long it is, its repeat points, the filters (one per type)\n"
    "and the tune set as registering the file would read it (a noise level moves to file_gain).\n"
    "\n"
    "  --json               print the same as JSON\n";

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
            failure("cannot read the " + std::string(what) + " of " + quoted(path) +
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
    const KOVA_TUNE_SET& t = in.tune;
    std::fprintf(f, "\ntune set:\n");
    std::fprintf(f, "  gain        %s\n  pan         %s\n", num(t.gain).c_str(),
                 num(t.pan).c_str());
    std::fprintf(f, "  oscillator  %s, depth %s\n", t.osc_enable == 1 ? "on" : "off",
                 num(t.osc_depth).c_str());
    std::fprintf(f, "  sharpening  %s, sharpness %s\n", t.sharp_enable == 1 ? "on" : "off",
                 num(t.sharpness).c_str());
    std::fprintf(f, "  wn_gain     %s\n  file_gain   %s\n", num(t.wn_gain).c_str(),
                 num(t.file_gain).c_str());
    std::fprintf(f, "  start_gain  %s\n  loop_gain   %s\n  end_gain    %s\n",
                 num(t.start_gain).c_str(), num(t.loop_gain).c_str(), num(t.end_gain).c_str());
}

void print_json(const std::string& path, const FileInfo& in) {
    JsonWriter j(out());
    j.begin_object();
    j.key("file").value(path);
    j.key("slots").begin_object();
    for (int s = 0; s < KOVA_SLOT_COUNT; ++s) {
        j.key(slot_name(s)).begin_object();
        j.key("present").value(in.present(s));
        if (in.present(s)) {
            j.key("offset").value(in.offset[s]);
            j.key("size").value(in.size[s]);
            j.key("length_ms").value(in.repeat.len_ms[s]);
            j.key("repeat_start_ms").value(in.repeat.rpt_start_ms[s]);
            j.key("repeat_end_ms").value(in.repeat.rpt_end_ms[s]);
        }
        j.end_object();
    }
    j.end_object();
    j.key("filters").begin_array();
    for (uint32_t t = 0; t < KOVA_FLT_TYPE_COUNT; ++t) {
        if (!in.has_filter(t)) continue;
        const KOVA_FLT_DSC& d = in.filters[t];
        j.begin_object();
        j.key("type").value(filter_type_name(t));
        j.key("type_code").value(t);
        j.key("freq").value(d.freq);
        j.key("bandwidth").value(d.bandwidth);
        j.key("enable").value(d.enable);
        j.key("samplerate").value(d.samplerate);
        j.key("channels").value(d.channels);
        j.end_object();
    }
    j.end_array();
    const KOVA_TUNE_SET& t = in.tune;
    j.key("tune").begin_object();
    j.key("gain").value(t.gain);
    j.key("pan").value(t.pan);
    j.key("osc_enable").value(t.osc_enable);
    j.key("osc_depth").value(t.osc_depth);
    j.key("sharp_enable").value(t.sharp_enable);
    j.key("sharpness").value(t.sharpness);
    j.key("wn_gain").value(t.wn_gain);
    j.key("file_gain").value(t.file_gain);
    j.key("start_gain").value(t.start_gain);
    j.key("loop_gain").value(t.loop_gain);
    j.key("end_gain").value(t.end_gain);
    j.end_object();
    j.end_object();
}

}  // namespace

int run_inspect(Args& args) {
    bool json = false;
    std::string path;
    while (!args.done()) {
        const std::string name(args.next());
        if (name == "--help" || name == "-h") {
            std::fprintf(out(), "%s", kHelp);
            return kExitOk;
        }
        if (name == "--json") {
            json = true;
        } else if (name == "--verbose" || name == "-v") {
            set_library_chatter(true);
        } else if (name.size() > 1 && name[0] == '-') {
            usage_error("unknown option " + quoted(name) + " (see kova inspect --help)");
        } else if (!path.empty()) {
            usage_error("one file at a time (got " + quoted(path) + " and " + quoted(name) + ")");
        } else {
            path = name;
        }
    }
    if (path.empty()) usage_error("no file given (kova inspect [--json] FILE)");
    check_source_set_file(path, false);
    const FileInfo info = query(path);
    std::fflush(stdout);
    if (json) {
        print_json(path, info);
    } else {
        print_text(path, info);
    }
    return kExitOk;
}

}  // namespace kova_tool
