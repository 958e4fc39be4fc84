/*
 * libKovaFastTrack: records, constants and error codes shared by every module.
 *
 * Records that are written to source-set files (KOVA_FLT_DSC, KOVA_TUNE_SET, the KOVA_SRC image
 * and KOVA_SRC_INFO) are fixed-layout images of these structs; their sizes and offsets are pinned
 * by static assertions at the end of this header.
 */
#ifndef KOVA_TYPES_H
#define KOVA_TYPES_H

#include <pthread.h>
#include <stddef.h>
#include <stdint.h>

#define KOVA_API __attribute__((visibility("default")))

#ifdef __cplusplus
#define KOVA_EXTERN_C_BEGIN extern "C" {
#define KOVA_EXTERN_C_END }
#else
#define KOVA_EXTERN_C_BEGIN
#define KOVA_EXTERN_C_END
#endif

/* Error codes. */
#define KOVA_OK 0
#define KOVA_ERR_INVALID_FORMAT (-1)
#define KOVA_ERR_INSUFF_MEM (-2)
#define KOVA_ERR_INVALID_PARAM (-3)
#define KOVA_ERR_SOURCE (-4)
#define KOVA_ERR_SRC_FULL (-5)

/* Motion phases. */
#define KOVA_ACTION_START 0u
#define KOVA_ACTION_MOVE 1u
#define KOVA_ACTION_END 2u

/* Source slots and their maximum PCM length in bytes. */
#define KOVA_SLOT_START 0
#define KOVA_SLOT_LOOP 1
#define KOVA_SLOT_END 2
#define KOVA_SLOT_COUNT 3
#define KOVA_SLOT_START_MAX_BYTES 38400
#define KOVA_SLOT_LOOP_MAX_BYTES 192000
#define KOVA_SLOT_END_MAX_BYTES 38400

/* Where a source's samples came from. */
#define KOVA_ORIGIN_NOISE 0
#define KOVA_ORIGIN_FILE 1
#define KOVA_ORIGIN_SAVEFILE 2

/* Filter type codes; codes above 3 are invalid. */
#define KOVA_FLT_LOWPASS 0u
#define KOVA_FLT_HIGHPASS 1u
#define KOVA_FLT_BANDPASS 2u
#define KOVA_FLT_BANDREJECT 3u
#define KOVA_FLT_TYPE_COUNT 4

/* Handle tags. KOVA_FLT carries the same tag as KOVA_CTX. */
#define KOVA_CTX_TAG 0x4B4F5641u
#define KOVA_FLT_TAG 0x4B4F5641u
#define KOVA_OSC_TAG 0x4B4F5653u

/* Engine limits. */
#define KOVA_MAX_SRCSETS 20          /* by files or by filter */
#define KOVA_MAX_SRCSETS_SAVEFILE 21 /* a saved file may add a 21st set */
#define KOVA_WORK_BUF_BYTES 192000
#define KOVA_PATH_BUF_BYTES 512

/* ---- Linked list ---------------------------------------------------------------------- */

typedef struct NODE {
    void* data;
    struct NODE* prev;
    struct NODE* next;
} NODE;

typedef struct LIST {
    NODE* head;
    NODE* tail;
    uint32_t count;
} LIST;

/* ---- Engine records --------------------------------------------------------------------- */

typedef struct KOVA_FORMAT {
    uint32_t sample_rate;
    uint32_t channels;
    uint32_t p;
    uint32_t w;
    uint32_t h;
} KOVA_FORMAT;

typedef struct KOVA_PARAM {
    float x;
    float y;
    int64_t time;
    float aux;
    uint32_t action;
} KOVA_PARAM;

typedef struct KOVA_PCMBUF {
    int16_t* data;
    int32_t size; /* bytes */
} KOVA_PCMBUF;

/* ---- Source model ---------------------------------------------------------------------- */

typedef struct KOVA_FLT_DSC {
    uint32_t type;
    double freq;
    double bandwidth;
    uint32_t enable;
    int32_t samplerate;
    int32_t channels;
} KOVA_FLT_DSC;

typedef struct KOVA_TUNE_SET {
    double gain;
    double pan;
    int32_t osc_enable;
    double osc_depth;
    int32_t sharp_enable;
    double sharpness;
    double wn_gain;
    double file_gain;
    double start_gain;
    double loop_gain;
    double end_gain;
} KOVA_TUNE_SET;

typedef struct KOVA_SRC {
    int16_t* pcm;
    int16_t* pcm_proc;
    char* path;
    int32_t size;
    int32_t pos; /* in 16-bit samples */
    int32_t slot;
    int32_t origin;
    int32_t rpt_start;
    int32_t rpt_end;
} KOVA_SRC;

typedef struct KOVA_SRCSET {
    KOVA_SRC* src[KOVA_SLOT_COUNT];
    LIST* filters; /* of KOVA_FLT_DSC* */
    KOVA_TUNE_SET* tune;
    double thickness;
} KOVA_SRCSET;

/* Exists only in source-set files. */
typedef struct KOVA_SRC_INFO {
    int32_t has_src[KOVA_SLOT_COUNT];
    int32_t samplerate;
    int32_t channels;
} KOVA_SRC_INFO;

typedef struct KOVA_RPT_INFO {
    int64_t len_ms[KOVA_SLOT_COUNT];
    int32_t rpt_start_ms[KOVA_SLOT_COUNT];
    int32_t rpt_end_ms[KOVA_SLOT_COUNT];
} KOVA_RPT_INFO;

/* ---- Signal blocks --------------------------------------------------------------------- */

typedef struct KOVA_OSC {
    uint32_t tag;
    void* self;
    int32_t sample_rate;
    uint32_t channels;
    double freq;
    uint32_t waveform; /* 1 square, 2 sawtooth, other sine */
    int64_t period;
    int64_t phase;
    uint32_t hold;
} KOVA_OSC;

typedef struct KOVA_EQ {
    double low_coef;
    double low_state;
    double high_coef;
    double high_state;
    double hist[3];
    double low_gain;
    double mid_gain;
    double high_gain;
    double slew_decay;
} KOVA_EQ;

typedef struct KOVA_BIQUAD {
    double c;
    double d;
    double a0;
    double a1;
    double a2;
    double b1;
    double b2;
    double* x1;
    double* x2;
    double* y1;
    double* y2;
} KOVA_BIQUAD;

typedef struct KOVA_FLT {
    uint32_t tag;
    void* self;
    KOVA_FLT_DSC* dsc;
    KOVA_BIQUAD* biquad;
} KOVA_FLT;

/* ---- Engine context -------------------------------------------------------------------- */

typedef struct KOVA_CTX {
    uint32_t tag;
    int32_t active_src;
    uint32_t stroke;
    LIST* src_list; /* of KOVA_SRCSET* */
    KOVA_FORMAT* format;
    KOVA_PARAM* prev_param;
    int16_t* work_buf; /* KOVA_WORK_BUF_BYTES */
    pthread_mutex_t* mutex;
    KOVA_OSC* osc;
    double prev_env;
    double norm;
    int32_t fast_count;
    KOVA_EQ* eq;
    int16_t slew_odd;
    int16_t slew_even;
    double volume;
} KOVA_CTX;

/* ---- File access layer ------------------------------------------------------------------ */

typedef struct TARQ_MFAL {
    void* (*open)(struct TARQ_MFAL* m, int mode); /* mode bit 0: read-write + create */
    void (*close)(void* h);
    int (*read)(void* h, void* buf, int len);
    int (*write)(void* h, const void* buf, int len);
    int (*getpos)(void* h, int64_t* pos);
    int (*setpos)(void* h, const int64_t* pos);
    int (*skip)(void* h, const int64_t* count);
    int (*getsize)(void* h, int64_t* size);
    char* path; /* KOVA_PATH_BUF_BYTES, owned by the user of the object */
} TARQ_MFAL;

/* ---- Ring buffer -------------------------------------------------------------------------- */

typedef struct KOVA_RINGBUFFER {
    uint8_t* buf;
    uint32_t writeIdx;
    uint32_t readIdx;
    uint32_t size;
    uint32_t mask;
} KOVA_RINGBUFFER;

/* ---- Layout pins for records stored in files ----------------------------------------------- */

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

#endif /* KOVA_TYPES_H */
