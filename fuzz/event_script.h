// The byte language of the generation fuzz target: an engine format, a sound source and a
// sequence of operations (motion events with a buffer size each, tune set, thickness, volume,
// set management). The decoder lives in the target; ScriptWriter writes the same layout, so the
// seed generator can express realistic strokes that the fuzzer then mutates.
//
// Layout (all values in machine byte order):
//   header   u8 format flags, u16 w, u16 h, [raw: u32 rate, u32 channels, u32 p]
//   source   u8 kind (0 files, 1 filter, 2 both, above 2 files), then per kind:
//            files:  u16 start bytes, u16 loop bytes (x4), u16 end bytes, u8 amplitude
//            filter: a filter record (u8 type, f32 freq, f32 bandwidth, u8 enable)
//   ops      until the input ends: u8 opcode, then its operands (see Op)
#ifndef KOVA_FUZZ_EVENT_SCRIPT_H
#define KOVA_FUZZ_EVENT_SCRIPT_H

#include <cstdint>
#include <cstring>
#include <vector>

namespace kova_fuzz {

// Format flags.
constexpr uint8_t kFmtRateMask = 0x07;  // index into kScriptRates
constexpr uint8_t kFmtMono = 0x08;
constexpr uint8_t kFmtPan = 0x10;
constexpr uint8_t kFmtRaw = 0x20;  // rate, channels and p follow as raw u32 values
constexpr uint32_t kScriptRates[8] = {8000, 11025, 16000, 22050, 24000, 32000, 44100, 48000};

enum SourceKind : uint8_t { kSourceFiles = 0, kSourceFilter = 1, kSourceBoth = 2 };

// Opcodes (taken modulo kOpCount, events weighted by four codes).
enum Op : uint8_t {
    kOpEvent = 0,      // 0..3: u8 flags, coordinates, time, buffer size (see EventFlags)
    kOpTune = 4,       // u8 raw?; raw: 88-byte record image; else 11 scaled bytes
    kOpThickness = 5,  // u8 raw?; raw: f64; else u8 scaled to -0.1..1.1
    kOpVolume = 6,     // same encoding as thickness
    kOpAdmin = 7,      // u8 sub-op (see AdminOp), operands
    kOpCount = 8,
};

// Event flags.
constexpr uint8_t kEvActionMask = 0x03;  // 3: a raw u32 action follows
constexpr uint8_t kEvRawXY = 0x04;       // f32 x, f32 y follow; else i16 dx, i16 dy
constexpr uint8_t kEvRawTime = 0x08;     // i64 time follows; else u8 dt in ms

enum AdminOp : uint8_t {
    kAdminSelect = 0,     // i8 identifier
    kAdminRegFilter = 1,  // filter record
    kAdminAttach = 2,     // filter record
    kAdminUpdate = 3,     // filter record
    kAdminRepeat = 4,     // i16 x 9: len, start, end ms per slot
    kAdminResave = 5,     // none: save the active set and register the file again
    kAdminCount = 6,
};

// Buffer size selector: < 16 the size itself, < 0xF0 a multiple of 80 plus 0..3, else a u32
// modulo 1000001 follows.
inline int32_t decode_buffer_size(uint8_t sel, uint32_t raw) {
    if (sel < 16) return sel;
    if (sel < 0xF0) return (sel - 16) * 80 + (sel & 3);
    return static_cast<int32_t>(raw % 1000001u);
}

class ScriptWriter {
   public:
    ScriptWriter& u8(uint8_t v) { return put(v); }
    ScriptWriter& u16(uint16_t v) { return put(v); }
    ScriptWriter& i16(int16_t v) { return put(v); }
    ScriptWriter& u32(uint32_t v) { return put(v); }
    ScriptWriter& i64(int64_t v) { return put(v); }
    ScriptWriter& f32(float v) { return put(v); }
    ScriptWriter& f64(double v) { return put(v); }

    ScriptWriter& header(uint8_t rate_index, bool mono, bool pan, uint16_t w, uint16_t h) {
        return u8(static_cast<uint8_t>((rate_index & kFmtRateMask) | (mono ? kFmtMono : 0) |
                                       (pan ? kFmtPan : 0)))
            .u16(w)
            .u16(h);
    }
    ScriptWriter& files(uint16_t start, uint16_t loop_quarter, uint16_t end, uint8_t amplitude) {
        return u8(kSourceFiles).u16(start).u16(loop_quarter).u16(end).u8(amplitude);
    }
    ScriptWriter& filter_record(uint8_t type, float freq, float bandwidth, uint8_t enable) {
        return u8(type).f32(freq).f32(bandwidth).u8(enable);
    }
    ScriptWriter& filter(uint8_t type, float freq, float bandwidth) {
        return u8(kSourceFilter).filter_record(type, freq, bandwidth, 1);
    }
    // A move, down or up `dt` ms after the previous event, shifted by (dx, dy) pixels.
    ScriptWriter& event(uint8_t action, int16_t dx, int16_t dy, uint8_t dt, uint8_t buffer_sel) {
        return u8(kOpEvent).u8(action & kEvActionMask).i16(dx).i16(dy).u8(dt).u8(buffer_sel);
    }
    ScriptWriter& tune_scaled(const uint8_t (&fields)[11]) {
        u8(kOpTune).u8(0);
        for (uint8_t f : fields) u8(f);
        return *this;
    }
    ScriptWriter& thickness(uint8_t scaled) { return u8(kOpThickness).u8(0).u8(scaled); }
    ScriptWriter& volume(uint8_t scaled) { return u8(kOpVolume).u8(0).u8(scaled); }
    ScriptWriter& admin(AdminOp op) { return u8(kOpAdmin).u8(op); }

    const std::vector<uint8_t>& bytes() const { return out_; }

   private:
    template <typename T>
    ScriptWriter& put(T v) {
        uint8_t b[sizeof(T)];
        std::memcpy(b, &v, sizeof(T));
        out_.insert(out_.end(), b, b + sizeof(T));
        return *this;
    }
    std::vector<uint8_t> out_;
};

}  // namespace kova_fuzz

#endif
