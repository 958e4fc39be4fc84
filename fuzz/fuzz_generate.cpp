// Motion events, tune sets, thickness and volume values and set management decoded from the
// input (see event_script.h) and run through kova_gen_sounds with output buffers of every size.
// One engine context serves every input of the same format (reset in between).
//
// Properties: no crash or undefined behaviour for any value (NaN and infinite coordinates and
// gains included); every result is a whole, non-negative byte count that fits the buffer;
// nothing is written past the buffer (guard bytes); generation allocates nothing; refused
// events (negative coordinates or time, unknown action, empty buffer) produce nothing; a move
// that does not continue an open stroke produces nothing.
#include <cstdint>
#include <cstring>
#include <vector>

#include "event_script.h"
#include "fuzz_support.h"

using namespace kova_fuzz;

namespace {

double scaled(uint8_t b, double lo, double hi) {
    return lo + (hi - lo) * b / 255.0;
}

// Deterministic PCM for a file source: a ramp with a little noise; amplitude 255 gives a
// full-scale square wave that drives the clipper. Not instrumented: a per-sample loop of the
// harness, not of the library.
__attribute__((no_sanitize("coverage"))) std::vector<uint8_t> make_pcm(size_t bytes,
                                                                       uint8_t amplitude,
                                                                       uint32_t seed) {
    std::vector<uint8_t> pcm(bytes);
    uint32_t x = seed | 1;
    for (size_t i = 0; i + 1 < bytes; i += 2) {
        x ^= x << 13;
        x ^= x >> 17;
        x ^= x << 5;
        int32_t v;
        if (amplitude == 255) {
            v = (i / 2 / 37) % 2 ? 32767 : -32768;
        } else {
            v = static_cast<int32_t>((i / 2 % 200) * 300 - 30000) * amplitude / 255 +
                static_cast<int32_t>(x % 512) - 256;
        }
        const auto s = static_cast<int16_t>(v < -32768 ? -32768 : (v > 32767 ? 32767 : v));
        std::memcpy(&pcm[i], &s, 2);
    }
    if (bytes % 2) pcm[bytes - 1] = 0x11;
    return pcm;
}

KOVA_FLT_DSC read_filter(Bytes& in, const KOVA_FORMAT& f) {
    KOVA_FLT_DSC d{};
    d.type = in.take<uint8_t>();
    d.freq = in.take<float>();
    d.bandwidth = in.take<float>();
    d.enable = in.take<uint8_t>();
    d.samplerate = static_cast<int32_t>(f.sample_rate);
    d.channels = static_cast<int32_t>(f.channels);
    return d;
}

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
        const auto sel = in.take<uint8_t>();
        int32_t size = decode_buffer_size(sel, sel >= 0xF0 ? in.take<uint32_t>() : 0);
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
            t.wn_gain = scaled(in.take<uint8_t>(), 0.0, 1.0);
            t.file_gain = scaled(in.take<uint8_t>(), 0.0, 1.0);
            t.start_gain = scaled(in.take<uint8_t>(), 0.0, 1.5);
            t.loop_gain = scaled(in.take<uint8_t>(), 0.0, 1.5);
            t.end_gain = scaled(in.take<uint8_t>(), 0.0, 1.5);
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
        switch (in.take<uint8_t>() % kAdminCount) {
            case kAdminSelect: {
                const int32_t id = in.take<int8_t>();
                const int32_t rc = kova_set_active_src(ctx_, id);
                FUZZ_CHECK(rc == ((id >= 1 && id <= count) ? KOVA_OK : KOVA_ERR_INVALID_PARAM));
                break;
            }
            case kAdminRegFilter: {
                const KOVA_FLT_DSC d = read_filter(in, format_);
                if (!costly()) break;
                const int32_t id = kova_reg_src_byfilter(ctx_, &d, &err);
                FUZZ_CHECK(id == 0 ? kova_get_src_num(ctx_) == count : id == count + 1);
                break;
            }
            case kAdminAttach: {
                const KOVA_FLT_DSC d = read_filter(in, format_);
                if (!costly()) break;
                kova_attach_filter(ctx_, count, &d, &err);
                break;
            }
            case kAdminUpdate: {
                const KOVA_FLT_DSC d = read_filter(in, format_);
                if (!costly()) break;
                kova_update_filter(ctx_, count, &d, &err);
                break;
            }
            case kAdminRepeat: {
                KOVA_RPT_INFO info{};
                for (auto& v : info.len_ms) v = in.take<int16_t>();
                for (auto& v : info.rpt_start_ms) v = in.take<int16_t>();
                for (auto& v : info.rpt_end_ms) v = in.take<int16_t>();
                kova_set_rptinfo(ctx_, count, &info);
                break;
            }
            case kAdminResave: {
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

    // Registering a noise source, filtering a set again or saving and reading it back works
    // through up to 270 KB of samples (about a millisecond here, several times a cheap input):
    // two per input (a noise source as the first set counts), further ones are skipped, so such
    // inputs cannot dominate the run. Their order with everything else still varies.
    bool costly() { return costly_left_-- > 0; }

   private:
    static constexpr int64_t kOutputBudget = 32 * 1024;
    static constexpr int32_t kCappedBuffer = 512;
    int64_t output_left_ = kOutputBudget;
    int costly_left_ = 2;
    KOVA_CTX* ctx_;
    KOVA_FORMAT format_;
    KOVA_PARAM last_{540.0f, 1140.0f, 1000, 0.0f, KOVA_ACTION_START};
    enum class Stroke { kClosed, kOpen, kUnknown };
    Stroke stroke_ = Stroke::kClosed;
};

bool register_files(Bytes& in, KOVA_CTX* ctx) {
    static const ScratchFile files[KOVA_SLOT_COUNT] = {
        ScratchFile("gen-start"), ScratchFile("gen-loop"), ScratchFile("gen-end")};
    const size_t start = in.take<uint16_t>();
    const size_t loop = static_cast<size_t>(in.take<uint16_t>()) * 4;
    const size_t end = in.take<uint16_t>();
    const uint8_t amplitude = in.take<uint8_t>();
    const size_t lengths[KOVA_SLOT_COUNT] = {start, loop, end};
    // The files depend on length and amplitude only; most inputs keep the previous ones.
    static size_t written_length[KOVA_SLOT_COUNT] = {SIZE_MAX, SIZE_MAX, SIZE_MAX};
    static uint8_t written_amplitude = 0;
    const char* paths[KOVA_SLOT_COUNT];
    for (int slot = 0; slot < KOVA_SLOT_COUNT; ++slot) {
        paths[slot] = files[slot].path();
        if (written_length[slot] == lengths[slot] && written_amplitude == amplitude) continue;
        const std::vector<uint8_t> pcm = make_pcm(lengths[slot], amplitude, 7u + slot);
        files[slot].rewrite(pcm.data(), pcm.size());
        written_length[slot] = lengths[slot];
    }
    written_amplitude = amplitude;
    int32_t err = 0;
    const int32_t id = kova_reg_src_byfiles(ctx, paths, &err);
    FUZZ_CHECK((id == 1) == (loop > 0));
    return id == 1;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    Bytes in(data, size);
    const uint8_t flags = in.take<uint8_t>();
    KOVA_FORMAT f{};
    f.sample_rate = kScriptRates[flags & kFmtRateMask];
    f.channels = (flags & kFmtMono) ? 1 : 2;
    f.p = (flags & kFmtPan) ? 1 : 0;
    f.w = in.take<uint16_t>();
    f.h = in.take<uint16_t>();
    if (flags & kFmtRaw) {
        f.sample_rate = in.take<uint32_t>();
        f.channels = in.take<uint32_t>();
        f.p = in.take<uint32_t>();
    }
    const ReusedCtx engine(f);
    KOVA_CTX* ctx = engine.get();
    if (ctx == nullptr) {
        FUZZ_CHECK(kova_checkformat(&f) < 1 && engine.init_error() == KOVA_ERR_INVALID_FORMAT);
        return 0;
    }
    int32_t err = 0;

    // 0, 1, 2 as in event_script.h; any other value means files (a noise source costs about a
    // millisecond to make, so random kinds must not turn most inputs into filter inputs).
    const uint8_t kind_byte = in.take<uint8_t>();
    const uint8_t kind = kind_byte <= kSourceBoth ? kind_byte : uint8_t{kSourceFiles};
    if (kind == kSourceFiles || kind == kSourceBoth) register_files(in, ctx);
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
