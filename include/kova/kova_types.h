/**
 * @file kova_types.h
 * @brief Records, constants and error codes shared by every module.
 *
 * Conventions that hold for the whole interface:
 * - PCM is interleaved signed 16-bit little-endian; lengths are in bytes, play positions in 16-bit
 *   samples; milliseconds appear only in the repeat information (::KOVA_RPT_INFO).
 * - Failures are reported by value: a negative error code (`KOVA_ERR_...`), or a null/0 result
 *   with the code stored through an `err` out-parameter that the function presets on entry.
 * - Every handle (::KOVA_CTX, ::KOVA_FLT, ::KOVA_OSC) starts with a 32-bit tag; an operation
 *   given a null handle or one whose tag does not match returns ::KOVA_ERR_INVALID_PARAM or a
 *   neutral result, never crashes on the tag check.
 * - Every heap object has one owner; release functions accept null.
 *
 * Records that are written to source-set files (::KOVA_FLT_DSC, ::KOVA_TUNE_SET, the
 * ::KOVA_SRC image and ::KOVA_SRC_INFO) are fixed-layout images of these structs; their sizes and
 * offsets are pinned by static assertions at the end of this header.
 */
#ifndef KOVA_TYPES_H
#define KOVA_TYPES_H

#include <pthread.h>
#include <stddef.h>
#include <stdint.h>

/** @cond KOVA_INTERNAL */
#define KOVA_API __attribute__((visibility("default")))

#ifdef __cplusplus
#define KOVA_EXTERN_C_BEGIN extern "C" {
#define KOVA_EXTERN_C_END }
#else
#define KOVA_EXTERN_C_BEGIN
#define KOVA_EXTERN_C_END
#endif
/** @endcond */

/** @name Error codes
 * Returned by value or stored through an `err` out-parameter.
 * @{ */
#define KOVA_OK 0                    /**< Success. */
#define KOVA_ERR_INVALID_FORMAT (-1) /**< kova_init() rejected the ::KOVA_FORMAT block. */
#define KOVA_ERR_INSUFF_MEM (-2)     /**< An allocation failed; nothing was changed. */
/** A null or dead handle, an identifier out of range, a null or invalid argument, a missing
 * source set, or a file that could not be opened for reading. */
#define KOVA_ERR_INVALID_PARAM (-3)
/** A sound source could not be loaded, or a file could not be created. */
#define KOVA_ERR_SOURCE (-4)
/** The context already holds ::KOVA_MAX_SRCSETS source sets (::KOVA_MAX_SRCSETS_SAVEFILE for
 * registration from a saved file). */
#define KOVA_ERR_SRC_FULL (-5)
/** @} */

/** @name Motion phases (KOVA_PARAM::action)
 * @{ */
#define KOVA_ACTION_START 0u /**< The touch goes down: plays the start sound. */
#define KOVA_ACTION_MOVE 1u  /**< The touch moves: plays loop sound shaped by the speed. */
#define KOVA_ACTION_END 2u   /**< The touch goes up: plays the whole end sound. */
/** @} */

/** @name Source slots and their maximum PCM length in bytes
 * @{ */
#define KOVA_SLOT_START 0               /**< Slot of the start sound. */
#define KOVA_SLOT_LOOP 1                /**< Slot of the loop sound (required for a move). */
#define KOVA_SLOT_END 2                 /**< Slot of the end sound. */
#define KOVA_SLOT_COUNT 3               /**< Number of slots of a source set. */
#define KOVA_SLOT_START_MAX_BYTES 38400 /**< Most bytes a start file contributes (0.2 s). */
#define KOVA_SLOT_LOOP_MAX_BYTES 192000 /**< Most bytes a loop file contributes (1 s). */
#define KOVA_SLOT_END_MAX_BYTES 38400   /**< Most bytes an end file contributes (0.2 s). */
/** @} */

/** @name Origins of a source's samples (KOVA_SRC::origin)
 * @{ */
#define KOVA_ORIGIN_NOISE 0    /**< Filtered white noise. */
#define KOVA_ORIGIN_FILE 1     /**< A raw PCM file. */
#define KOVA_ORIGIN_SAVEFILE 2 /**< A source-set file written by kova_save_source(). */
/** @} */

/** @name Filter type codes (KOVA_FLT_DSC::type); codes above 3 are invalid
 * @{ */
#define KOVA_FLT_LOWPASS 0u    /**< Low-pass biquad. */
#define KOVA_FLT_HIGHPASS 1u   /**< High-pass biquad. */
#define KOVA_FLT_BANDPASS 2u   /**< Band-pass biquad. */
#define KOVA_FLT_BANDREJECT 3u /**< Band-reject (notch) biquad. */
#define KOVA_FLT_TYPE_COUNT 4  /**< Number of filter types: the size of arrays indexed by type. */
/** @} */

/** @name Handle tags
 * A live handle's first field holds its tag; a freed one holds 0.
 * @{ */
#define KOVA_CTX_TAG 0x4B4F5641u /**< Tag of a live ::KOVA_CTX. */
#define KOVA_FLT_TAG 0x4B4F5641u /**< Tag of a live ::KOVA_FLT (the same as the context's). */
#define KOVA_OSC_TAG 0x4B4F5653u /**< Tag of a live ::KOVA_OSC. */
/** @} */

/** @name Engine limits
 * @{ */
#define KOVA_MAX_SRCSETS 20          /**< Most source sets registered from files or by filter. */
#define KOVA_MAX_SRCSETS_SAVEFILE 21 /**< A saved file may add a 21st set. */
#define KOVA_WORK_BUF_BYTES 192000   /**< Size of KOVA_CTX::work_buf, the staging buffer. */
#define KOVA_PATH_BUF_BYTES 512      /**< Size of a path buffer; paths must be shorter. */
/** @} */

/* ---- Linked list ---------------------------------------------------------------------- */

/** One element of a ::LIST. The list owns its nodes; `data` belongs to whoever put it there. */
typedef struct NODE {
    void* data;        /**< The payload; null in the sentinels. */
    struct NODE* prev; /**< The previous node; null in the head sentinel. */
    struct NODE* next; /**< The next node; null in the tail sentinel. */
} NODE;

/** Doubly linked list of untyped payloads with head and tail sentinels; positions are 0-based.
 * Not thread-safe: its owner serialises every access. */
typedef struct LIST {
    NODE* head;     /**< Head sentinel (no payload). */
    NODE* tail;     /**< Tail sentinel (no payload). */
    uint32_t count; /**< Number of elements between the sentinels. */
} LIST;

/* ---- Engine records --------------------------------------------------------------------- */

/** The format block given to kova_init(); see kova_checkformat() for the rules. */
typedef struct KOVA_FORMAT {
    uint32_t sample_rate; /**< Output sample rate in Hz, 8000 to 48000. */
    uint32_t channels;    /**< Interleaved output channels, 1 or 2. */
    /** Position panning: 1 = the left and right gains follow the touch position across the
     * screen width (needs 2 channels and non-zero `w` and `h`); any other value = off. */
    uint32_t p;
    uint32_t w; /**< Screen width in pixels; with `h` it normalises the touch speed. */
    uint32_t h; /**< Screen height in pixels. */
} KOVA_FORMAT;

/** One motion event of a stroke. */
typedef struct KOVA_PARAM {
    float x;      /**< Horizontal touch position in pixels, 0 or more. */
    float y;      /**< Vertical touch position in pixels, 0 or more. */
    int64_t time; /**< Event time in milliseconds, 0 or more, not decreasing within a stroke. */
    float aux;    /**< Passed through with the record; the engine never reads it. */
    /** The phase. This must be one of ::KOVA_ACTION_START, ::KOVA_ACTION_MOVE or
     * ::KOVA_ACTION_END. */
    uint32_t action;
} KOVA_PARAM;

/** A buffer of interleaved signed 16-bit samples, owned by the caller. */
typedef struct KOVA_PCMBUF {
    int16_t* data; /**< The samples. */
    int32_t size;  /**< Capacity in bytes (or, for a result, the bytes it holds). */
} KOVA_PCMBUF;

/* ---- Source model ---------------------------------------------------------------------- */

/** A filter descriptor: one biquad of a set's filter chain. Stored as a 40-byte record in
 * source-set files. */
typedef struct KOVA_FLT_DSC {
    /** The filter type. This must be one of ::KOVA_FLT_LOWPASS, ::KOVA_FLT_HIGHPASS,
     * ::KOVA_FLT_BANDPASS or ::KOVA_FLT_BANDREJECT. */
    uint32_t type;
    double freq;        /**< Cut-off (low-, high-pass) or centre (band types) frequency in Hz. */
    double bandwidth;   /**< Band width in Hz (band types only). */
    uint32_t enable;    /**< 1 = the filter is applied; any other value = kept but skipped. */
    int32_t samplerate; /**< Sample rate in Hz the filter is designed for. */
    int32_t channels;   /**< Interleaved channels of the signal, 1 or 2. */
} KOVA_FLT_DSC;

/** The eleven values that map motion to sound, one record per source set. Every value is
 * taken by kova_set_tuneset() only when it lies in 0.0 to 1.0. Stored as an 88-byte record. */
typedef struct KOVA_TUNE_SET {
    double gain; /**< Factor of every phase's gain, 0 to 1 (1.0 by default). */
    double pan;  /**< Position panning depth, 0 to 1: left 1 - pan*x/w, right 1 - pan + pan*x/w. */
    int32_t osc_enable; /**< 1 = the oscillator modulates the loop sound; 0 = off. */
    double osc_depth;   /**< Oscillator frequency = speed envelope * osc_depth * 200 Hz; 0 to 1. */
    int32_t sharp_enable; /**< 1 = the loop sound's pitch rises with speed; 0 = off. */
    double sharpness;  /**< Pitch ratio = max(1, 1 + (envelope - 1) * sharpness * 0.1); 0 to 1. */
    double wn_gain;    /**< Level of a loop sound generated as noise, 0 to 1. */
    double file_gain;  /**< Level of a loop sound loaded from a file, 0 to 1. */
    double start_gain; /**< Gain of the start sound, 0 to 1. */
    double loop_gain;  /**< Gain of the loop sound, 0 to 1. */
    double end_gain;   /**< Gain of the end sound, 0 to 1. */
} KOVA_TUNE_SET;

/** One piece of PCM of a source set, owned by its set (released with kova_free_sourceobj()).
 * In source-set files it is stored as a 48-byte image followed by `size` bytes of `pcm`. */
typedef struct KOVA_SRC {
    int16_t* pcm;      /**< The samples as loaded or generated (unfiltered), `size` bytes, owned. */
    int16_t* pcm_proc; /**< The samples after the set's filters, `size` bytes, owned; played. */
    char* path;        /**< The PCM file (::KOVA_PATH_BUF_BYTES buffer), owned; null unless
                          ::KOVA_ORIGIN_FILE. */
    int32_t size;      /**< Length of `pcm` and `pcm_proc` in bytes. */
    int32_t pos;       /**< Play position in 16-bit samples; 0 whenever `pcm_proc` is rebuilt. */
    int32_t slot;      /**< ::KOVA_SLOT_START, ::KOVA_SLOT_LOOP or ::KOVA_SLOT_END. */
    int32_t origin;    /**< ::KOVA_ORIGIN_NOISE, ::KOVA_ORIGIN_FILE or ::KOVA_ORIGIN_SAVEFILE. */
    int32_t rpt_start; /**< Repeat start in bytes, within `size` (0 after loading). */
    int32_t rpt_end;   /**< Repeat end in bytes, within `size` (`size` after loading). */
} KOVA_SRC;

/** A source set: up to three sounds with their filters, tune set and thickness. Owned by the
 * context's list; released with kova_free_sourceset(). */
typedef struct KOVA_SRCSET {
    KOVA_SRC* src[KOVA_SLOT_COUNT]; /**< The sounds by slot; null for an absent slot. */
    LIST* filters;                  /**< ::KOVA_FLT_DSC pointers, at most one per type; owned. */
    KOVA_TUNE_SET* tune;            /**< The set's tune set, owned. */
    double thickness; /**< Equaliser thickness, 0 (thin) to 1 (thick); 0.6 at registration. */
} KOVA_SRCSET;

/** Which slots a source-set file holds and in which format. Exists only in source-set files
 * (20 bytes). */
typedef struct KOVA_SRC_INFO {
    int32_t has_src[KOVA_SLOT_COUNT]; /**< 1 when the slot's record follows in the file, else 0. */
    int32_t samplerate;               /**< Sample rate in Hz of the engine that saved the set. */
    int32_t channels;                 /**< Channels of the engine that saved the set. */
} KOVA_SRC_INFO;

/** Repeat information of a source set, in milliseconds, per slot (indexed by ::KOVA_SLOT_START,
 * ::KOVA_SLOT_LOOP, ::KOVA_SLOT_END). */
typedef struct KOVA_RPT_INFO {
    int64_t len_ms[KOVA_SLOT_COUNT]; /**< Length of each sound; 0 for an absent slot. Read only. */
    int32_t rpt_start_ms[KOVA_SLOT_COUNT]; /**< Where the repeat starts, from the sound's start. */
    int32_t rpt_end_ms[KOVA_SLOT_COUNT];   /**< Where the repeat ends, from the sound's start. */
} KOVA_RPT_INFO;

/* ---- Signal blocks --------------------------------------------------------------------- */

/** An oscillator (kova_osc_init()); its fields are the oscillator's state, read but not written
 * by callers. */
typedef struct KOVA_OSC {
    uint32_t tag;        /**< ::KOVA_OSC_TAG while alive. */
    void* self;          /**< The record's own address while alive. */
    int32_t sample_rate; /**< Sample rate in Hz. */
    uint32_t channels;   /**< Channels; each value is repeated on every channel. */
    double freq;         /**< Frequency in Hz; 10.0 at creation. */
    uint32_t waveform;   /**< 1 square, 2 sawtooth, any other value sine. */
    int64_t period;      /**< Samples per cycle: `sample_rate` / `freq`, truncated. */
    int64_t phase;       /**< Position within the cycle, in samples. */
    uint32_t hold;       /**< For 2 channels: 1 when the current value was handed out once. */
} KOVA_OSC;

/** The thickness equaliser: a three-band split with per-band gains (kova_eq_init()). Plain
 * state owned by the caller; its fields are read but not written by callers. */
typedef struct KOVA_EQ {
    double low_coef;   /**< Low-band one-pole coefficient. */
    double low_state;  /**< Low-band filter state. */
    double high_coef;  /**< High-band one-pole coefficient. */
    double high_state; /**< High-band filter state. */
    double hist[3];    /**< The last three normalised inputs, newest first. */
    double low_gain;   /**< Gain of the low band. */
    double mid_gain;   /**< Gain of the middle band; always 1.0. */
    double high_gain;  /**< Gain of the high band. */
    double slew_decay; /**< Slew limiter decay that generation uses, set with the thickness. */
} KOVA_EQ;

/** Coefficients and state of one biquad (makefilter()). The state pointers are owned by the
 * ::KOVA_FLT that holds the record: one double per channel each. */
typedef struct KOVA_BIQUAD {
    double c;   /**< The design's tangent term; not used by processing. */
    double d;   /**< 2 cos(2 pi freq / rate) for the band types, else 0; not used by processing. */
    double a0;  /**< Feed-forward coefficient of x[n]. */
    double a1;  /**< Feed-forward coefficient of x[n-1]. */
    double a2;  /**< Feed-forward coefficient of x[n-2]. */
    double b1;  /**< Feedback coefficient of y[n-1]. */
    double b2;  /**< Feedback coefficient of y[n-2]. */
    double* x1; /**< x[n-1] per channel. */
    double* x2; /**< x[n-2] per channel. */
    double* y1; /**< y[n-1] per channel. */
    double* y2; /**< y[n-2] per channel. */
} KOVA_BIQUAD;

/** A filter context (kova_flt_init()): a descriptor copy and its biquad. */
typedef struct KOVA_FLT {
    uint32_t tag;        /**< ::KOVA_FLT_TAG while alive. */
    void* self;          /**< The record's own address while alive. */
    KOVA_FLT_DSC* dsc;   /**< Copy of the descriptor, owned. */
    KOVA_BIQUAD* biquad; /**< The biquad, owned. */
} KOVA_FLT;

/* ---- Engine context -------------------------------------------------------------------- */

/** The engine context (kova_init()), owned by its creator and freed with kova_deinit().
 * Callers treat it as opaque; the fields document the state it carries. */
typedef struct KOVA_CTX {
    uint32_t tag;        /**< ::KOVA_CTX_TAG while alive, 0 after kova_deinit(). */
    int32_t active_src;  /**< 1-based identifier of the active set; 0 = none. */
    uint32_t stroke;     /**< 1 while a stroke is in progress, 0 after an end. */
    LIST* src_list;      /**< The registered ::KOVA_SRCSET pointers, owned; set n is element n-1. */
    KOVA_FORMAT* format; /**< Copy of the format block (`p` forced to 0 for 1 channel), owned. */
    KOVA_PARAM* prev_param; /**< The last start or move event, owned. */
    int16_t* work_buf;      /**< Staging buffer of ::KOVA_WORK_BUF_BYTES, owned. */
    pthread_mutex_t*
        mutex;          /**< Held by registration, filter updates, repeat information and saving. */
    KOVA_OSC* osc;      /**< The oscillator, owned. */
    double prev_env;    /**< Speed envelope of the previous move; 1.0 after a start. */
    double norm;        /**< 10000 / sqrt(w*w + h*h): normalisation of the move energy. */
    int32_t fast_count; /**< Fast moves since the last loop reset. */
    KOVA_EQ* eq;        /**< The thickness equaliser, owned. */
    int16_t slew_odd;   /**< Slew limiter state of odd samples. */
    int16_t slew_even;  /**< Slew limiter state of even samples. */
    double volume;      /**< Output volume: 0.8 times the value given to kova_set_volume(). */
} KOVA_CTX;

/* ---- File access layer ------------------------------------------------------------------ */

/** The file-access object, filled by tarq_mfal_init(); all file I/O of the library goes through
 * it. Each operation takes the handle returned by `open`. */
typedef struct TARQ_MFAL {
    /** Opens `path`: mode bit 0 set = read-write, created with mode 0644 if missing, not
     * truncated; clear = read-only. Returns a handle, or null. */
    void* (*open)(struct TARQ_MFAL* m, int mode);
    void (*close)(void* h); /**< Closes the file and frees the handle. */
    int (*read)(void* h, void* buf,
                int len); /**< One read: bytes read, 0 at the end, -1 on error. */
    int (*write)(void* h, const void* buf, int len); /**< One write: bytes written, or -1. */
    int (*getpos)(void* h, int64_t* pos);            /**< Stores the current offset; 0, or -1. */
    int (*setpos)(void* h, const int64_t* pos);      /**< Seeks to an absolute offset; 0, or -1. */
    int (*skip)(void* h,
                const int64_t* count);      /**< Moves forward by count (at least 1); 0, or -1. */
    int (*getsize)(void* h, int64_t* size); /**< Stores the file size in bytes; 0, or -1. */
    char* path; /**< The path, a ::KOVA_PATH_BUF_BYTES buffer owned (and freed) by the user. */
} TARQ_MFAL;

/* ---- Ring buffer -------------------------------------------------------------------------- */

/** A single-producer single-consumer byte queue (kova_ringbuffer_create()). It holds at most
 * `size` - 1 bytes; it has no lock, its users serialise every call. */
typedef struct KOVA_RINGBUFFER {
    uint8_t* buf;      /**< The storage, `size` bytes, owned. */
    uint32_t writeIdx; /**< Index of the next byte to write, below `size`. */
    uint32_t readIdx;  /**< Index of the next byte to read, below `size`; equal to `writeIdx` when
                          empty. */
    uint32_t size;     /**< Storage size in bytes, a power of two, at least 2. */
    uint32_t mask;     /**< `size` - 1. */
} KOVA_RINGBUFFER;

/* ---- Layout pins for records stored in files ----------------------------------------------- */

/** @cond KOVA_INTERNAL */
#ifdef __cplusplus
#define KOVA_STATIC_ASSERT static_assert
#else
#define KOVA_STATIC_ASSERT _Static_assert
#endif

KOVA_STATIC_ASSERT(sizeof(KOVA_FLT_DSC) == 40, "KOVA_FLT_DSC must be 40 bytes");
KOVA_STATIC_ASSERT(offsetof(KOVA_FLT_DSC, type) == 0, "KOVA_FLT_DSC.type");
KOVA_STATIC_ASSERT(offsetof(KOVA_FLT_DSC, freq) == 8, "KOVA_FLT_DSC.freq");
KOVA_STATIC_ASSERT(offsetof(KOVA_FLT_DSC, bandwidth) == 16, "KOVA_FLT_DSC.bandwidth");
KOVA_STATIC_ASSERT(offsetof(KOVA_FLT_DSC, enable) == 24, "KOVA_FLT_DSC.enable");
KOVA_STATIC_ASSERT(offsetof(KOVA_FLT_DSC, samplerate) == 28, "KOVA_FLT_DSC.samplerate");
KOVA_STATIC_ASSERT(offsetof(KOVA_FLT_DSC, channels) == 32, "KOVA_FLT_DSC.channels");

KOVA_STATIC_ASSERT(sizeof(KOVA_TUNE_SET) == 88, "KOVA_TUNE_SET must be 88 bytes");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, gain) == 0, "KOVA_TUNE_SET.gain");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, pan) == 8, "KOVA_TUNE_SET.pan");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, osc_enable) == 16, "KOVA_TUNE_SET.osc_enable");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, osc_depth) == 24, "KOVA_TUNE_SET.osc_depth");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, sharp_enable) == 32, "KOVA_TUNE_SET.sharp_enable");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, sharpness) == 40, "KOVA_TUNE_SET.sharpness");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, wn_gain) == 48, "KOVA_TUNE_SET.wn_gain");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, file_gain) == 56, "KOVA_TUNE_SET.file_gain");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, start_gain) == 64, "KOVA_TUNE_SET.start_gain");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, loop_gain) == 72, "KOVA_TUNE_SET.loop_gain");
KOVA_STATIC_ASSERT(offsetof(KOVA_TUNE_SET, end_gain) == 80, "KOVA_TUNE_SET.end_gain");

KOVA_STATIC_ASSERT(sizeof(KOVA_SRC_INFO) == 20, "KOVA_SRC_INFO must be 20 bytes");

/* The stored source record is the 64-bit image of KOVA_SRC: three 8-byte reference words, then
 * six 32-bit fields. A 32-bit build (the WebAssembly studio) has a smaller KOVA_SRC; its reader
 * and writer use the stored offsets of source/source_io.h, so its files are the same. */
#if UINTPTR_MAX > 0xFFFFFFFFu
KOVA_STATIC_ASSERT(sizeof(KOVA_SRC) == 48, "KOVA_SRC image must be 48 bytes");
KOVA_STATIC_ASSERT(offsetof(KOVA_SRC, size) == 24, "KOVA_SRC.size");
KOVA_STATIC_ASSERT(offsetof(KOVA_SRC, pos) == 28, "KOVA_SRC.pos");
KOVA_STATIC_ASSERT(offsetof(KOVA_SRC, slot) == 32, "KOVA_SRC.slot");
KOVA_STATIC_ASSERT(offsetof(KOVA_SRC, origin) == 36, "KOVA_SRC.origin");
KOVA_STATIC_ASSERT(offsetof(KOVA_SRC, rpt_start) == 40, "KOVA_SRC.rpt_start");
KOVA_STATIC_ASSERT(offsetof(KOVA_SRC, rpt_end) == 44, "KOVA_SRC.rpt_end");
#endif

/** @endcond */

#endif /* KOVA_TYPES_H */
