// SPDX-License-Identifier: Apache-2.0
/* Test-only JNI library: lets the Java tests see what the stand-in audio device received and
 * which lines the library wrote to the Android log. Loaded before libKovaFastTrack, so its logger
 * is in place when the library's load hook runs. */
#include <android/log.h>
#include <jni.h>

#include <mutex>
#include <string>
#include <vector>

#include "kova_host/audio_sink.h"

namespace {

std::mutex g_log_lock;
std::string g_log;  // one line after another, each ended by a newline

/* Keeps the lines of the library's Java-facing layer; a line at another priority than info is
 * kept with its priority in front, so a test comparing texts notices it. */
void capture_logger(const __android_logger_data* data, const char* message) {
    if (!data || !data->tag || std::string(data->tag) != "kova_jni") return;
    std::lock_guard<std::mutex> lock(g_log_lock);
    if (data->priority != ANDROID_LOG_INFO)
        g_log += "[priority " + std::to_string(data->priority) + "] ";
    g_log += std::string(message ? message : "") + "\n";
}

}  // namespace

extern "C" {

JNIEXPORT jint JNICALL JNI_OnLoad(JavaVM* /*vm*/, void* /*reserved*/) {
    __android_log_set_minimum_priority(ANDROID_LOG_VERBOSE);
    __android_log_set_logger(capture_logger);
    return JNI_VERSION_1_6;
}

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

/* The lines captured since the last call, taken out of the capture. */
JNIEXPORT jstring JNICALL Java_com_corvane_audio_KovaTestHooks_takeLog(JNIEnv* env, jclass) {
    std::lock_guard<std::mutex> lock(g_log_lock);
    const jstring out = env->NewStringUTF(g_log.c_str());
    g_log.clear();
    return out;
}

}  // extern "C"
