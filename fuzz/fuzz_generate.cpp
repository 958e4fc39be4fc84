// SPDX-License-Identifier: Apache-2.0
// Motion events, tune sets, thickness and volume values and set management decoded from the
// input and run through kova_gen_sounds with output buffers of every size.
//
// Input layout (all values in machine byte order):
//   header   u8 format flags (kFmt*), u16 w, u16 h, [raw: u32 rate, u32 channels, u32 p]
//   source   u8 kind (0 files, 1 filter, 2 both, above 2 files), then per kind:
//            files:  u16 start bytes, u16 loop bytes (x4), u16 end bytes, u8 amplitude
//            filter: a filter record (u8 type, f32 freq, f32 bandwidth, u8 enable)
//   ops      until the input ends: u8 opcode (modulo 8), then its operands:
//            0..3 event: u8 flags (kEv*), x and y (raw f32 or i16 steps), time (raw i64 or u8
//                 step in ms), u8 buffer size selector (see buffer_size);
//            4 tune set: u8 raw?; raw: the record's image; else 11 scaled bytes;
//            5 thickness, 6 volume: u8 raw?; raw: f64; else u8 scaled to -0.1..1.1;
//            7 set management: u8 sub-op (AdminOp), its operands.
// fuzz/corpus/generate holds scripts of realistic strokes in this layout.
//
// Properties: no crash or undefined behaviour for any value (NaN and infinite coordinates and
// gains included); every result is a whole, non-negative byte count that fits the buffer;
// nothing is written past the buffer (guard bytes); generation allocates nothing; refused
// events (negative coordinates or time, unknown action, empty buffer) produce nothing; a move
// that does not continue an open stroke produces nothing.
#include <cstdint>
#include <cstring>

#include "fuzz_support.h"

using namespace kova_fuzz;

namespace {

constexpr uint8_t kFmtRateMask = 0x07;  // index into kRates
constexpr uint8_t kFmtMono = 0x08;
constexpr uint8_t kFmtPan = 0x10;
constexpr uint8_t kFmtRaw = 0x20;  // rate, channels and p follow as raw u32 values
constexpr uint32_t kRates[8] = {8000, 11025, 16000, 22050, 24000, 32000, 44100, 48000};
constexpr uint8_t kEvActionMask = 0x03;  // 3: a raw u32 action follows
constexpr uint8_t kEvRawXY = 0x04;
constexpr uint8_t kEvRawTime = 0x08;
enum SourceKind : uint8_t { kSourceFiles = 0, kSourceFilter = 1, kSourceBoth = 2 };
enum Op : uint8_t { kOpTune = 4, kOpThickness = 5, kOpVolume = 6, kOpAdmin = 7, kOpCount = 8 };
// Operands: select i8 identifier; the filter ones a filter record; repeat i16 x 9 (len, start,
// end ms per slot); resave none (saves the active set and registers the file again).
enum AdminOp : uint8_t { kSelect, kRegFilter, kAttach, kUpdate, kRepeat, kResave, kAdminCount };

// Buffer size selector: < 16 the size itself, < 0xF0 a multiple of 80 plus 0..3, else a u32
// modulo 1000001 follows.
int32_t buffer_size(Bytes& in) {
    const auto sel = in.take<uint8_t>();
    if (sel < 16) return sel;
    if (sel < 0xF0) return (sel - 16) * 80 + (sel & 3);
    return static_cast<int32_t>(in.take<uint32_t>() % 1000001u);
}

double scaled(uint8_t b, double lo, double hi) {
    return lo + (hi - lo) * b / 255.0;
}

// Deterministic PCM for a file source: a ramp with a little noise; amplitude 255 gives a
// full-scale square wave that drives the clipper. Written to `out` (`bytes` long). Neither
// instrumented nor checked: a per-sample loop of the harness, not of the library.
__attribute__((no_sanitize("coverage", "address", "undefined"))) void make_pcm(uint8_t* out,
                                                                               size_t bytes,
                                                                               uint8_t amplitude,
                                                                               uint32_t seed) {
    uint32_t x = seed;
    for (size_t n = 0; n < bytes / 2; ++n) {
        x = x * 1664525u + 1013904223u;
        const int32_t ramp = (static_cast<int32_t>(n % 200) * 300 - 30000) * amplitude / 255;
        const int32_t square = (n / 37) % 2 ? 32767 : -32768;
        const auto s = static_cast<int16_t>(amplitude == 255 ? square : ramp + (x >> 23) - 256);
        std::memcpy(out + 2 * n, &s, 2);
    }
    if (bytes % 2) out[bytes - 1] = 0x11;
}

// A filter record (u8 type, f32 freq, f32 bandwidth, u8 enable) for the engine's format.
KOVA_FLT_DSC read_filter(Bytes& in, const KOVA_FORMAT& f) {
    return {in.take<uint8_t>(),
            in.take<float>(),
            in.take<float>(),
            in.take<uint8_t>(),
            static_cast<int32_t>(f.sample_rate),
            static_cast<int32_t>(f.channels)};
}

// The three PCM files of a file source; their content follows from the lengths and amplitude
// an input gives.
struct PcmFiles {
    const ScratchFile files[KOVA_SLOT_COUNT] = {ScratchFile("gen-start"), ScratchFile("gen-loop"),
                                                ScratchFile("gen-end")};
    const char* paths[KOVA_SLOT_COUNT] = {files[0].path(), files[1].path(), files[2].path()};

    void write(const size_t (&lengths)[KOVA_SLOT_COUNT], uint8_t amplitude) const {
        static uint8_t pcm[size_t{UINT16_MAX} * 4];
        for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
            make_pcm(pcm, lengths[slot], amplitude, 7u + slot);
            files[slot].rewrite(pcm, lengths[slot]);
        }
    }
};

PcmFiles g_pcm_files;

class Session {
   public:
    Session(KOVA_CTX* ctx, const KOVA_FORMAT& f) : ctx_(ctx), format_(f) {}

    void event(Bytes& in) {
        const uint8_t flags = in.take<uint8_t>();
        KOVA_PARAM ev = last_;
        ev.action = flags & kEvActionMask;
        if (ev.action == 3) ev.action = in.take<uint32_t>();
        if (flags & kEvRawXY) {
            ev.x = in.take<float>();
            ev.y = in.take<float>();
        } else {
            ev.x = last_.x + in.take<int16_t>();
            ev.y = last_.y + in.take<int16_t>();
        }
        // A step after a raw time near INT64_MAX wraps (as the engine's time difference does)
        // instead of overflowing here.
        const auto step = [&] {
            return static_cast<int64_t>(static_cast<uint64_t>(last_.time) + in.take<uint8_t>());
        };
        ev.time = (flags & kEvRawTime) ? in.take<int64_t>() : step();
        int32_t size = buffer_size(in);
        // Once an input has generated kOutputBudget bytes, its further buffers hold 512 bytes
        // at most: the events still run every check and state change, without megabytes of
        // per-sample work that the earlier events already covered.
        if (output_left_ <= 0 && size > kCappedBuffer) size = kCappedBuffer;

        const int32_t bytes = checked_gen(ctx_, ev, size);
        output_left_ -= bytes;
        const bool refused = !(ev.x >= 0.0f || ev.x != ev.x) || !(ev.y >= 0.0f || ev.y != ev.y) ||
                             ev.time < 0 || ev.action > KOVA_ACTION_END || size < 1 ||
                             kova_get_src_num(ctx_) == 0;
        if (refused) {
            FUZZ_CHECK(bytes == 0);
            return;
        }
        if (ev.action == KOVA_ACTION_MOVE && stroke_ == Stroke::kClosed) FUZZ_CHECK(bytes == 0);
        stroke_ = ev.action == KOVA_ACTION_END ? Stroke::kClosed : Stroke::kOpen;
        last_ = ev;
    }

    void tune(Bytes& in) {
        KOVA_TUNE_SET t{};
        if (in.take<uint8_t>() & 1) {
            size_t got = 0;
            const uint8_t* raw = in.span(sizeof t, &got);
            std::memcpy(&t, raw, got);
        } else {
            t.gain = scaled(in.take<uint8_t>(), 0.0, 2.0);
            t.pan = scaled(in.take<uint8_t>(), 0.0, 1.0);
            t.osc_enable = in.take<uint8_t>() & 1;
            t.osc_depth = scaled(in.take<uint8_t>(), -0.1, 1.1);
            t.sharp_enable = in.take<uint8_t>() & 1;
            t.sharpness = scaled(in.take<uint8_t>(), -0.1, 1.1);
            for (double* v : {&t.wn_gain, &t.file_gain}) *v = scaled(in.take<uint8_t>(), 0.0, 1.0);
            for (double* v : {&t.start_gain, &t.loop_gain, &t.end_gain})
                *v = scaled(in.take<uint8_t>(), 0.0, 1.5);
        }
        const int32_t active = kova_get_src_num(ctx_);  // the newest set is the usual active one
        kova_set_tuneset(ctx_, active, &t);
    }

    static double value(Bytes& in) {
        return (in.take<uint8_t>() & 1) ? in.take<double>() : scaled(in.take<uint8_t>(), -0.1, 1.1);
    }

    void admin(Bytes& in) {
        // A set without a loop source refuses every event, so after the active set or its
        // sources may have changed the engine's stroke state is no longer followed here.
        stroke_ = Stroke::kUnknown;
        int32_t err = 0;
        const int32_t count = kova_get_src_num(ctx_);
        const uint8_t op = in.take<uint8_t>() % kAdminCount;
        switch (op) {
            case kSelect: {
                const int32_t id = in.take<int8_t>();
                const int32_t rc = kova_set_active_src(ctx_, id);
                FUZZ_CHECK(rc == ((id >= 1 && id <= count) ? KOVA_OK : KOVA_ERR_INVALID_PARAM));
                break;
            }
            case kRegFilter: {
                const KOVA_FLT_DSC d = read_filter(in, format_);
                if (!costly()) break;
                const int32_t id = kova_reg_src_byfilter(ctx_, &d, &err);
                FUZZ_CHECK(id == 0 ? kova_get_src_num(ctx_) == count : id == count + 1);
                break;
            }
            case kAttach:
            case kUpdate: {
                const KOVA_FLT_DSC d = read_filter(in, format_);
                if (!costly()) break;
                (op == kAttach ? kova_attach_filter : kova_update_filter)(ctx_, count, &d, &err);
                break;
            }
            case kRepeat: {
                KOVA_RPT_INFO info{};
                for (auto& v : info.len_ms) v = in.take<int16_t>();
                for (auto& v : info.rpt_start_ms) v = in.take<int16_t>();
                for (auto& v : info.rpt_end_ms) v = in.take<int16_t>();
                kova_set_rptinfo(ctx_, count, &info);
                break;
            }
            case kResave: {
                static const ScratchFile saved("gen-saved");
                if (!costly()) break;
                saved.remove();
                if (count >= 1 && kova_save_source(ctx_, count, saved.path()) >= 0) {
                    const int32_t id = kova_reg_src_bysavefile(ctx_, saved.path(), &err);
                    FUZZ_CHECK(id == 0 ? err != KOVA_OK : id == count + 1);
                }
                break;
            }
        }
    }

    // Registering a noise source, filtering a set again or saving and
    // reading it back works through up to 270 KB of samples (about a millisecond here, several
    // times a cheap input): two per input (a noise source made for the first set counts),
    // further ones are skipped, so such inputs cannot dominate the run. Their order with
    // everything else still varies.
    bool costly() { return costly_left_-- > 0; }

   private:
    static constexpr int64_t kOutputBudget = 16 * 1024;
    static constexpr int32_t kCappedBuffer = 512;
    int64_t output_left_ = kOutputBudget;
    int costly_left_ = 2;
    KOVA_CTX* ctx_;
    KOVA_FORMAT format_;
    KOVA_PARAM last_{540.0f, 1140.0f, 1000, 0.0f, KOVA_ACTION_START};
    enum class Stroke { kClosed, kOpen, kUnknown };
    Stroke stroke_ = Stroke::kClosed;
};

void register_files(Bytes& in, KOVA_CTX* ctx) {
    // start, loop (in units of 4 bytes), end; a braced list reads them in this order
    const size_t lengths[KOVA_SLOT_COUNT] = {in.take<uint16_t>(), in.take<uint16_t>() * size_t{4},
                                             in.take<uint16_t>()};
    const uint8_t amplitude = in.take<uint8_t>();
    g_pcm_files.write(lengths, amplitude);
    int32_t err = 0;
    const int32_t id = kova_reg_src_byfiles(ctx, g_pcm_files.paths, &err);
    FUZZ_CHECK((id == 1) == (lengths[KOVA_SLOT_LOOP] > 0));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    Bytes in(data, size);
    const uint8_t flags = in.take<uint8_t>();
    // Braced lists read their operands in order.
    KOVA_FORMAT f{kRates[flags & kFmtRateMask], (flags & kFmtMono) ? 1u : 2u,
                  (flags & kFmtPan) ? 1u : 0u, in.take<uint16_t>(), in.take<uint16_t>()};
    if (flags & kFmtRaw)
        f = {in.take<uint32_t>(), in.take<uint32_t>(), in.take<uint32_t>(), f.w, f.h};
    const ScopedCtx engine(f);
    KOVA_CTX* ctx = engine.get();
    if (ctx == nullptr) {
        FUZZ_CHECK(kova_checkformat(&f) < 1 && engine.init_error() == KOVA_ERR_INVALID_FORMAT);
        return 0;
    }
    int32_t err = 0;

    // 0, 1, 2 as above; any other value means files (a noise source costs about a
    // millisecond to make, so random kinds must not turn most inputs into filter inputs).
    const uint8_t kind = in.take<uint8_t>();
    if (kind != kSourceFilter) register_files(in, ctx);
    if (kind == kSourceFilter || kind == kSourceBoth) {
        const KOVA_FLT_DSC d = read_filter(in, f);
        kova_reg_src_byfilter(ctx, &d, &err);
    }
    Session session(ctx, f);
    if (kind == kSourceFilter || kind == kSourceBoth) session.costly();
    while (!in.empty()) {
        const uint8_t op = in.take<uint8_t>() % kOpCount;
        if (op < kOpTune) {
            session.event(in);
        } else if (op == kOpTune) {
            session.tune(in);
        } else if (op == kOpThickness) {
            kova_set_thickness(ctx, Session::value(in));
        } else if (op == kOpVolume) {
            kova_set_volume(ctx, Session::value(in));
        } else {
            session.admin(in);
        }
    }
    return 0;
}
