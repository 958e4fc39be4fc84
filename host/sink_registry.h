// SPDX-License-Identifier: Apache-2.0
/* Internal to the host audio library: sink selection, counters and the one-shot open failure. */
#ifndef KOVA_HOST_SINK_REGISTRY_H
#define KOVA_HOST_SINK_REGISTRY_H

#include <stdint.h>

#include <memory>

#include "kova_host/audio_sink.h"

namespace kova_host {

/* A sink from the factory selected now (never null: falls back to a discarding one). */
std::unique_ptr<AudioSink> make_sink(uint32_t rate, uint32_t channels);
/* The pending forced initCheck() status, consumed (0 when none). */
int32_t take_open_failure();
void count_callback(bool underrun);
bool device_held();

}  // namespace kova_host

#endif
