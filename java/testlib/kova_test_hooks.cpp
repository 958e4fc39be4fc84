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
std::vector<std::string> g_log_lines;

/* Keeps the lines of the library's Java-facing layer; a line at another priority than info is
 * kept with its priority in front, so a test comparing texts notices it. */
void capture_logger(const __android_logger_data* data, const char* message) {
    if (!data || !data->tag || std::string(data->tag) != "kova_jni") return;
    std::string line = message ? message : "";
    if (data->priority != ANDROID_LOG_INFO) {
        line = "[priority " + std::to_string(data->priority) + "] " + line;
    }
    std::lock_guard<std::mutex> lock(g_log_lock);
    g_log_lines.push_back(std::move(line));
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

JNIEXPORT jobjectArray JNICALL Java_com_corvane_audio_KovaTestHooks_takeLogLines(JNIEnv* env,
                                                                                 jclass) {
    std::vector<std::string> lines;
    {
        std::lock_guard<std::mutex> lock(g_log_lock);
        lines.swap(g_log_lines);
    }
    jclass string_class = env->FindClass("java/lang/String");
    if (!string_class) return nullptr;
    jobjectArray out = env->NewObjectArray(static_cast<jsize>(lines.size()), string_class, nullptr);
    for (jsize i = 0; out && i < static_cast<jsize>(lines.size()); ++i) {
        jstring s = env->NewStringUTF(lines[i].c_str());
        env->SetObjectArrayElement(out, i, s);
        env->DeleteLocalRef(s);
    }
    return out;
}

}  // extern "C"
