// SPDX-License-Identifier: Apache-2.0
/* Host stand-in: the few audio types and constants of the platform that the output stream uses.
 * Values match the platform's, so the same calls compile and mean the same on a device. */
#ifndef KOVA_HOST_SYSTEM_AUDIO_H
#define KOVA_HOST_SYSTEM_AUDIO_H

#include <stdint.h>
#include <sys/types.h>

typedef enum {
    AUDIO_STREAM_DEFAULT = -1,
    AUDIO_STREAM_VOICE_CALL = 0,
    AUDIO_STREAM_SYSTEM = 1,
    AUDIO_STREAM_RING = 2,
    AUDIO_STREAM_MUSIC = 3,
} audio_stream_type_t;

typedef enum {
    AUDIO_FORMAT_DEFAULT = 0,
    AUDIO_FORMAT_PCM_16_BIT = 1,
} audio_format_t;

typedef uint32_t audio_channel_mask_t;
enum {
    AUDIO_CHANNEL_OUT_MONO = 0x1u,
    AUDIO_CHANNEL_OUT_STEREO = 0x3u,
};

typedef enum {
    AUDIO_OUTPUT_FLAG_NONE = 0x0,
    AUDIO_OUTPUT_FLAG_DIRECT = 0x1,
    AUDIO_OUTPUT_FLAG_PRIMARY = 0x2,
    AUDIO_OUTPUT_FLAG_FAST = 0x4,
} audio_output_flags_t;

typedef enum {
    AUDIO_SESSION_ALLOCATE = 0,
} audio_session_t;

/* Only ever passed as null here; the layout of the platform's records does not matter. */
typedef struct audio_offload_info_t audio_offload_info_t;
typedef struct audio_attributes_t audio_attributes_t;

#define AUDIO_UID_INVALID ((uid_t)-1)

#endif
