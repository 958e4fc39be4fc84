// Writes the seed corpora of the fuzz targets, made by the library itself:
//   OUT/srcset    source-set files saved through the engine: 0 to 4 filters times every
//                 combination of present slots (also the seeds of the file queries);
//   OUT/pcm       inputs of the PCM target: three raw files of assorted lengths, some beyond the
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
#include "kova/kova.h"

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

std::vector<uint8_t> tone(size_t bytes, int step) {
    std::vector<uint8_t> pcm(bytes);
    for (size_t i = 0; i + 1 < bytes; i += 2) {
        const auto s = static_cast<int16_t>(static_cast<int>(i / 2 % 64) * step - 32 * step);
        pcm[i] = static_cast<uint8_t>(s & 0xFF);
        pcm[i + 1] = static_cast<uint8_t>((s >> 8) & 0xFF);
    }
    return pcm;
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
        }
    }
    for (const auto& p : pcm_path) unlink(p.c_str());
}

void pcm_seed(const char* name, uint16_t start, uint16_t end, size_t loop) {
    std::vector<uint8_t> in;
    const uint16_t lens[2] = {start, end};
    for (uint16_t v : lens) {
        in.push_back(static_cast<uint8_t>(v & 0xFF));
        in.push_back(static_cast<uint8_t>(v >> 8));
    }
    for (size_t bytes : {static_cast<size_t>(start), static_cast<size_t>(end), loop}) {
        const std::vector<uint8_t> pcm = tone(bytes, 500);
        in.insert(in.end(), pcm.begin(), pcm.end());
    }
    write_file(g_out + "/pcm/" + name, in.data(), in.size());
}

void pcm_seeds() {
    mkdir((g_out + "/pcm").c_str(), 0755);
    pcm_seed("small", 64, 32, 256);
    pcm_seed("odd-lengths", 45, 3, 1001);
    pcm_seed("loop-only", 0, 0, 4000);
    pcm_seed("no-loop", 100, 100, 0);
    pcm_seed("over-limits", 39999, 38401, 192001);  // every slot cut at its limit
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
        ScriptWriter w;  // set management between strokes
        w.header(7, false, true, 1080, 2280)
            .u8(kova_fuzz::kSourceBoth)
            .u16(800)
            .u16(1000)
            .u16(800)
            .u8(90);
        w.filter_record(KOVA_FLT_LOWPASS, 3000.0f, 1.0f, 1);
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
