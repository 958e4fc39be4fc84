// The Java entry points the native benchmarks call directly. These use neither the JNI
// environment nor the class, so both are passed as null.
#ifndef KOVA_BENCH_JNI_ENTRIES_H
#define KOVA_BENCH_JNI_ENTRIES_H

#include <jni.h>

extern "C" {
jlong Java_com_corvane_audio_Kova_init(JNIEnv*, jclass, jint, jint, jint, jint, jint);
jint Java_com_corvane_audio_Kova_deinit(JNIEnv*, jclass, jlong);
jint Java_com_corvane_audio_Kova_gen_1tofasttrack(JNIEnv*, jclass, jlong, jfloat, jfloat, jlong,
                                                  jfloat, jint);
void Java_com_corvane_audio_Kova_start_1fasttrack(JNIEnv*, jclass, jlong);
void Java_com_corvane_audio_Kova_stop_1fasttrack(JNIEnv*, jclass, jlong);
}

#endif
