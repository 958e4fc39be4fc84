// SPDX-License-Identifier: Apache-2.0
/* Test-only JNI library: lets the Java tests choose the stand-in audio device's sink and see what
 * the capture sink received. */
#include <jni.h>

#include <vector>

#include "kova_host/audio_sink.h"

extern "C" {

JNIEXPORT void JNICALL Java_com_corvane_audio_KovaTestHooks_useCaptureSink(JNIEnv*, jclass) {
    kova_host_use_capture_sink();
}

JNIEXPORT void JNICALL Java_com_corvane_audio_KovaTestHooks_useNullSink(JNIEnv*, jclass) {
    kova_host_use_null_sink();
}

JNIEXPORT void JNICALL Java_com_corvane_audio_KovaTestHooks_clearCapture(JNIEnv*, jclass) {
    kova_host_capture_clear();
}

JNIEXPORT jbyteArray JNICALL Java_com_corvane_audio_KovaTestHooks_capture(JNIEnv* env, jclass) {
    std::vector<jbyte> bytes(kova_host_capture_size());
    bytes.resize(kova_host_capture_copy(bytes.data(), bytes.size()));
    jbyteArray out = env->NewByteArray(static_cast<jsize>(bytes.size()));
    if (out) env->SetByteArrayRegion(out, 0, static_cast<jsize>(bytes.size()), bytes.data());
    return out;
}

}  // extern "C"
