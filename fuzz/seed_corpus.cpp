// Writes the seed corpora of the fuzz targets, made by the library itself:
//   OUT/srcset    source-set files saved through the engine: 0 to 4 filters times every
//                 combination of present slots, and files whose payloads sit at, just below and
//                 just above every slot limit (also the seeds of the file queries); written in
//                 the chunk language of file_script.h;
//   OUT/pcm       inputs of the PCM target: three files of assorted lengths, at and beyond the
//                 slot limits;
//   OUT/generate  scripts of realistic strokes for the generation target.
// Usage: kova_fuzz_seeds OUT
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <string>
#include <vector>

#include "event_script.h"
#include "file_script.h"
#include "kova/kova.h"

using kova_fuzz::FileScript;
using kova_fuzz::ScriptWriter;

namespace {

std::string g_out;

void die(const std::string& what) {
    std::fprintf(stderr, "kova_fuzz_seeds: %s\n", what.c_str());
    std::exit(1);
}

void write_file(const std::string& path, const void* data, size_t size) {
    FILE* f = std::fopen(path.c_str(), "wb");
    if (f == nullptr || std::fwrite(data, 1, size, f) != size || std::fclose(f) != 0) {
        die("cannot write " + path);
    }
}

std::vector<uint8_t> read_whole(const std::string& path) {
    std::vector<uint8_t> bytes;
    FILE* f = std::fopen(path.c_str(), "rb");
    if (f == nullptr) die("cannot read " + path);
    uint8_t buf[4096];
    size_t n = 0;
    while ((n = std::fread(buf, 1, sizeof buf, f)) > 0) bytes.insert(bytes.end(), buf, buf + n);
    std::fclose(f);
    return bytes;
}

std::vector<uint8_t> tone(size_t bytes, int step) {
    std::vector<uint8_t> pcm(bytes);
    for (size_t i = 0; i + 1 < bytes; i += 2) {
        const auto s = static_cast<int16_t>(static_cast<int>(i / 2 % 64) * step - 32 * step);
        pcm[i] = static_cast<uint8_t>(s & 0xFF);
        pcm[i + 1] = static_cast<uint8_t>((s >> 8) & 0xFF);
    }
    return pcm;
}

// A stored source record: 48 bytes, size at 24, slot at 32, repeat points at 40 and 44.
std::vector<uint8_t> src_record(int32_t size, int32_t slot) {
    std::vector<uint8_t> r(48, 0);
    const int32_t fields[][2] = {{24, size}, {32, slot}, {40, 0}, {44, size}};
    for (const auto& f : fields) {
        for (int k = 0; k < 4; ++k) r[f[0] + k] = static_cast<uint8_t>(f[1] >> (8 * k));
    }
    return r;
}

// Files with every slot's payload at `delta` bytes from its limit (38400/192000/38400), one
// lowpass filter (disabled: filtering 270 KB per execution would slow the whole run; a mutation
// that enables it still can), the tune set of a registration from files.
void limit_seeds(const std::string& dir) {
    const int32_t limits[KOVA_SLOT_COUNT] = {KOVA_SLOT_START_MAX_BYTES, KOVA_SLOT_LOOP_MAX_BYTES,
                                             KOVA_SLOT_END_MAX_BYTES};
    for (int32_t delta : {0, -2, 2, 1000}) {
        FileScript w;
        const int32_t one = 1;
        w.literal(&one, 4);
        const KOVA_FLT_DSC lowpass{KOVA_FLT_LOWPASS, 4000.0, 1.0, 0, 48000, 2};
        w.literal(&lowpass, sizeof lowpass);
        const KOVA_TUNE_SET tune{1.0, 0.4, 0, 1.0, 0, 0.2, 0.0, 0.4, 0.6, 0.9, 0.6};
        w.literal(&tune, sizeof tune);
        const int32_t info[5] = {1, 1, 1, 48000, 2};
        w.literal(info, sizeof info);
        for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
            const std::vector<uint8_t> rec = src_record(limits[slot] + delta, slot);
            w.literal(rec.data(), rec.size());
            w.run(static_cast<uint32_t>(limits[slot] + delta), static_cast<uint8_t>(3 + slot));
        }
        char name[64];
        std::snprintf(name, sizeof name, "/limits%+d.kss", delta);
        write_file(dir + name, w.bytes().data(), w.bytes().size());
    }
}

// 0 to 4 filters times the 8 slot combinations. A set always gets its loop from a file; slots
// left out are emptied afterwards by replacing them with a file that does not exist.
void srcset_seeds() {
    const std::string dir = g_out + "/srcset";
    mkdir(dir.c_str(), 0755);
    const std::string pcm_path[KOVA_SLOT_COUNT] = {dir + "/.start.pcm", dir + "/.loop.pcm",
                                                   dir + "/.end.pcm"};
    const size_t pcm_bytes[KOVA_SLOT_COUNT] = {400, 2400, 302};
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        const std::vector<uint8_t> pcm = tone(pcm_bytes[slot], 300 + 200 * slot);
        write_file(pcm_path[slot], pcm.data(), pcm.size());
    }
    const KOVA_FLT_DSC filters[4] = {
        {KOVA_FLT_LOWPASS, 2000.0, 1.0, 1, 48000, 2},
        {KOVA_FLT_HIGHPASS, 200.0, 1.0, 1, 48000, 2},
        {KOVA_FLT_BANDPASS, 1000.0, 0.5, 1, 48000, 2},
        {KOVA_FLT_BANDREJECT, 3000.0, 2.0, 0, 48000, 2},
    };
    const std::string missing = dir + "/.missing.pcm";

    KOVA_FORMAT format{48000, 2, 1, 1080, 2280};
    for (int nflt = 0; nflt <= 4; ++nflt) {
        for (int mask = 0; mask < 8; ++mask) {
            int32_t err = 0;
            KOVA_CTX* ctx = kova_init(&format, &err);
            if (ctx == nullptr) die("kova_init failed");
            const char* paths[KOVA_SLOT_COUNT] = {pcm_path[0].c_str(), pcm_path[1].c_str(),
                                                  pcm_path[2].c_str()};
            if (kova_reg_src_byfiles(ctx, paths, &err) != 1) die("registration failed");
            for (int i = 0; i < nflt; ++i) {
                if (kova_attach_filter(ctx, 1, &filters[i], &err) != 1) die("attach failed");
            }
            KOVA_TUNE_SET tune{};
            kova_get_tuneset(ctx, 1, &tune);
            tune.osc_enable = mask & 1;
            tune.sharp_enable = (nflt + mask) & 1;
            tune.sharpness = 0.1 * nflt;
            tune.osc_depth = 0.05 * (mask + 1);
            kova_set_tuneset(ctx, 1, &tune);
            const char* drop[KOVA_SLOT_COUNT] = {};
            for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
                if (!(mask & (1 << slot))) drop[slot] = missing.c_str();
            }
            kova_update_src_byfiles(ctx, 1, drop, &err);
            char name[64];
            std::snprintf(name, sizeof name, "/set-f%d-slots%d%d%d.kss", nflt, mask & 1,
                          (mask >> 1) & 1, (mask >> 2) & 1);
            const std::string path = dir + name;
            unlink(path.c_str());
            if (kova_save_source(ctx, 1, path.c_str()) <= 0) die("save failed: " + path);
            kova_deinit(ctx);
            // The saved file, as literal chunks.
            const std::vector<uint8_t> file = read_whole(path);
            FileScript in;
            in.literal(file.data(), file.size());
            write_file(path, in.bytes().data(), in.bytes().size());
        }
    }
    for (const auto& p : pcm_path) unlink(p.c_str());
    limit_seeds(dir);
}

// A PCM input: per slot (start, loop, end) a length mode and value (see fuzz_pcm_load.cpp:
// 0 small, 0xFD limit minus, 0xFE limit plus, 0xFF value x 8), then one period of a tone that
// the files repeat.
struct PcmLen {
    uint8_t mode;
    uint16_t value;
};
void pcm_seed(const char* name, PcmLen start, PcmLen loop, PcmLen end) {
    std::vector<uint8_t> in;
    for (const PcmLen& l : {start, loop, end}) {
        in.push_back(l.mode);
        in.push_back(static_cast<uint8_t>(l.value & 0xFF));
        in.push_back(static_cast<uint8_t>(l.value >> 8));
    }
    const std::vector<uint8_t> period = tone(128, 500);
    in.insert(in.end(), period.begin(), period.end());
    write_file(g_out + "/pcm/" + name, in.data(), in.size());
}

void pcm_seeds() {
    mkdir((g_out + "/pcm").c_str(), 0755);
    pcm_seed("small", {0, 64}, {0, 256}, {0, 32});
    pcm_seed("odd-lengths", {0, 45}, {0, 1001}, {0, 3});
    pcm_seed("loop-only", {0, 0}, {0, 4000}, {0, 0});
    pcm_seed("no-loop", {0, 100}, {0, 0}, {0, 100});
    pcm_seed("at-limits", {0xFD, 0}, {0xFD, 0}, {0xFD, 0});
    pcm_seed("below-limits", {0xFD, 1}, {0xFD, 2}, {0xFD, 3});
    pcm_seed("over-limits", {0xFE, 1}, {0xFE, 2}, {0xFE, 63});  // every slot cut at its limit
}

// Buffer selectors: the host's 960000-byte buffer, a 3840-byte burst, tiny odd sizes.
constexpr uint8_t kBufHost = 0xF0;  // followed by a u32
constexpr uint8_t kBuf3840 = 64;
constexpr uint8_t kBuf3 = 3;

ScriptWriter& buffer_u32(ScriptWriter& w, uint8_t sel, uint32_t size) {
    if (sel >= 0xF0) w.u32(size);
    return w;
}

// A stroke: down, `moves` moves, up; deltas vary a little like a finger.
void stroke(ScriptWriter& w, int moves, int16_t dx, int16_t dy, uint8_t dt, uint8_t sel) {
    w.event(KOVA_ACTION_START, 0, 0, 40, sel);
    buffer_u32(w, sel, 960000);
    for (int i = 0; i < moves; ++i) {
        w.event(KOVA_ACTION_MOVE, static_cast<int16_t>(dx + i % 3),
                static_cast<int16_t>(dy - i % 2), static_cast<uint8_t>(dt + i % 4), sel);
        buffer_u32(w, sel, 960000);
    }
    w.event(KOVA_ACTION_END, 1, 1, dt, sel);
    buffer_u32(w, sel, 960000);
}

void generate_seed(const char* name, const ScriptWriter& w) {
    write_file(g_out + "/generate/" + name, w.bytes().data(), w.bytes().size());
}

void generate_seeds() {
    mkdir((g_out + "/generate").c_str(), 0755);
    const uint8_t tune_sharp_osc[11] = {128, 100, 1, 40, 1, 50, 128, 100, 150, 170, 150};
    {
        ScriptWriter w;  // a phone: 48 kHz stereo with panning, file sources, 16 ms events
        w.header(7, false, true, 1080, 2280).files(4000, 3000, 4000, 120);
        stroke(w, 30, 12, 20, 16, kBufHost);
        stroke(w, 30, 12, 20, 8, kBuf3840);
        generate_seed("phone-files", w);
    }
    {
        ScriptWriter w;  // file sources at the slot limits (38400, 4 x 48000, 38400), then past
        w.header(7, false, true, 1080, 2280).files(38400, 48000, 38400, 100);
        stroke(w, 8, 12, 20, 16, kBuf3840);
        stroke(w, 4, 30, 20, 199, kBufHost);
        generate_seed("files-at-limits", w);
        ScriptWriter v;
        v.header(7, false, true, 1080, 2280).files(40000, 48500, 39000, 100);
        stroke(v, 8, 12, 20, 16, kBuf3840);
        generate_seed("files-past-limits", v);
    }
    {
        ScriptWriter w;  // noise source, oscillator and pitch raise on, mono at 8 kHz
        w.header(0, true, false, 720, 1280).filter(KOVA_FLT_BANDPASS, 1200.0f, 0.7f);
        w.tune_scaled(tune_sharp_osc);
        stroke(w, 25, 30, 5, 12, kBufHost);
        generate_seed("mono-noise-sharp", w);
    }
    {
        ScriptWriter w;  // fast flings that restart the loop, a loud source that clips
        w.header(6, false, true, 1440, 3200).files(200, 500, 200, 255).volume(255);
        stroke(w, 12, 400, 300, 10, kBuf3840);
        stroke(w, 8, -300, 250, 30, kBuf3);
        generate_seed("fast-clipping", w);
    }
    {
        ScriptWriter w;  // set management between strokes (file sources: noise is costly)
        w.header(7, false, true, 1080, 2280).files(800, 1000, 800, 90);
        stroke(w, 6, 10, 10, 16, kBuf3840);
        w.admin(kova_fuzz::kAdminSelect).u8(1);
        w.thickness(200);
        stroke(w, 6, 10, 10, 16, kBuf3840);
        w.admin(kova_fuzz::kAdminAttach).filter_record(KOVA_FLT_HIGHPASS, 300.0f, 1.0f, 1);
        w.admin(kova_fuzz::kAdminRepeat);
        for (int16_t v : {10, 20, 10, 0, 5, 0, 10, 15, 10}) w.i16(v);
        stroke(w, 10, 10, 10, 16, kBuf3840);
        w.admin(kova_fuzz::kAdminResave);
        w.tune_scaled(tune_sharp_osc);
        stroke(w, 10, 10, 10, 16, kBufHost);
        generate_seed("admin", w);
    }
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) die("usage: kova_fuzz_seeds OUT");
    g_out = argv[1];
    mkdir(g_out.c_str(), 0755);
    // The library's diagnostic lines go to standard output; keep the console for our own.
    if (std::freopen("/dev/null", "w", stdout) == nullptr) die("cannot silence stdout");
    srcset_seeds();
    pcm_seeds();
    generate_seeds();
    std::fprintf(stderr, "kova_fuzz_seeds: corpora written under %s\n", g_out.c_str());
    return 0;
}
