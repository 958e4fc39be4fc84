/* Low-latency output helpers usable from C: the ring buffer and the per-device volume tables. */
#ifndef KOVA_OUTPUT_H
#define KOVA_OUTPUT_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/* Single-producer single-consumer byte queue; callers serialise access. */
KOVA_API KOVA_RINGBUFFER* kova_ringbuffer_create(uint32_t requested);
KOVA_API void kova_ringbuffer_free(KOVA_RINGBUFFER* rb);
KOVA_API void kova_ringbuffer_reset(KOVA_RINGBUFFER* rb);
KOVA_API uint32_t kova_ringbuffer_read_space(const KOVA_RINGBUFFER* rb);
KOVA_API uint32_t kova_ringbuffer_write_space(const KOVA_RINGBUFFER* rb);
KOVA_API uint32_t kova_ringbuffer_read(KOVA_RINGBUFFER* rb, void* dst, uint32_t len);
KOVA_API uint32_t kova_ringbuffer_write(KOVA_RINGBUFFER* rb, const void* src, uint32_t len);

/* Volume tables: 17 floats per row. */
#define KOVA_VOLUME_ROW 17
#define KOVA_VOLUME_DEVICE_VALUES 238
#define KOVA_VOLUME_SITUATION_VALUES 289
KOVA_API extern float spkVolume[KOVA_VOLUME_DEVICE_VALUES];
KOVA_API extern float headsetVolume[KOVA_VOLUME_DEVICE_VALUES];
KOVA_API extern float earpieceVolume[KOVA_VOLUME_DEVICE_VALUES];
KOVA_API extern float bluetoothVolume[KOVA_VOLUME_DEVICE_VALUES];
KOVA_API extern float usbVolume[KOVA_VOLUME_DEVICE_VALUES];
KOVA_API extern float hdmiVolume[KOVA_VOLUME_DEVICE_VALUES];
KOVA_API extern float situationVolume[KOVA_VOLUME_SITUATION_VALUES];
KOVA_API int kova_get_volumetablesize(int device);
KOVA_API void kova_get_volumetable(float* speaker, float* headset);

KOVA_EXTERN_C_END

#endif
