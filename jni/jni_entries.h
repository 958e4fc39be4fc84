// SPDX-License-Identifier: Apache-2.0
/* The native methods of com.corvane.audio.Kova and the library's load hooks, as the Java VM finds
 * them by name. Declared once here, so the definitions in jni/ are checked against the same
 * prototypes that the native tests and benchmarks call. */
#ifndef KOVA_JNI_ENTRIES_H
#define KOVA_JNI_ENTRIES_H

#include <jni.h>

extern "C" {
JNIEXPORT jint JNICALL JNI_OnLoad(JavaVM* vm, void* reserved);
JNIEXPORT void JNICALL JNI_OnUnload(JavaVM* vm, void* reserved);
JNIEXPORT jlong JNICALL Java_com_corvane_audio_Kova_init(JNIEnv*, jclass, jint sample_rate,
                                                         jint channels, jint p, jint w, jint h);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_deinit(JNIEnv*, jclass, jlong id);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_reg_1src_1byfiles(JNIEnv*, jclass, jlong id,
                                                                     jstring start, jstring loop,
                                                                     jstring end);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1src(JNIEnv*, jclass, jlong id, jint index);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_get_1src_1num(JNIEnv*, jclass, jlong id);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_gen_1sounds(JNIEnv*, jclass, jlong id,
                                                               jbyteArray out, jfloat x, jfloat y,
                                                               jlong time, jfloat aux, jint action);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_gen_1tofasttrack(JNIEnv*, jclass, jlong id,
                                                                    jfloat x, jfloat y, jlong time,
                                                                    jfloat aux, jint action);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1tuneset(
    JNIEnv*, jclass, jlong id, jint index, jdouble gain, jdouble pan, jint osc_enable,
    jdouble osc_depth, jint sharp_enable, jdouble sharpness, jdouble wn_gain, jdouble file_gain,
    jdouble start_gain, jdouble loop_gain, jdouble end_gain);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1thickness(JNIEnv*, jclass, jlong id,
                                                                  jdouble thickness);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1volume(JNIEnv*, jclass, jlong id,
                                                               jdouble volume);
JNIEXPORT void JNICALL Java_com_corvane_audio_Kova_stop_1fasttrack(JNIEnv*, jclass, jlong id);
JNIEXPORT void JNICALL Java_com_corvane_audio_Kova_start_1fasttrack(JNIEnv*, jclass, jlong id);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_get_1volumeTableSize(JNIEnv*, jclass,
                                                                        jint device);
JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_get_1volumeTable(JNIEnv*, jclass,
                                                                    jfloatArray speaker,
                                                                    jfloatArray headset);
}

#endif
