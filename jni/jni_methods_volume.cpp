// SPDX-License-Identifier: Apache-2.0
/* Java methods that read the output volume tables; they touch no instance and take no lock. */
#include <algorithm>
#include <array>

#include "jni/jni_entries.h"
#include "jni/jni_internal.h"
#include "kova/kova_output.h"

extern "C" {

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_get_1volumeTableSize(JNIEnv* /*env*/,
                                                                        jclass /*cls*/,
                                                                        jint device) {
    return kova_get_volumetablesize(device);
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_get_1volumeTable(JNIEnv* env, jclass /*cls*/,
                                                                    jfloatArray speaker,
                                                                    jfloatArray headset) {
    // A null array, or one shorter than a row, must not make the copy write outside the Java
    // array: the rows are staged here and each array receives as many values as it holds.
    if (!speaker || !headset) return 0;
    jfloat* spk = env->GetFloatArrayElements(speaker, nullptr);
    jfloat* hs = env->GetFloatArrayElements(headset, nullptr);
    if (spk && hs) {
        std::array<float, KOVA_VOLUME_ROW> spk_row{};
        std::array<float, KOVA_VOLUME_ROW> hs_row{};
        kova_get_volumetable(spk_row.data(), hs_row.data());
        const jsize spk_n = std::min<jsize>(env->GetArrayLength(speaker), KOVA_VOLUME_ROW);
        const jsize hs_n = std::min<jsize>(env->GetArrayLength(headset), KOVA_VOLUME_ROW);
        std::copy_n(spk_row.begin(), spk_n, spk);
        std::copy_n(hs_row.begin(), hs_n, hs);
    }
    if (spk) env->ReleaseFloatArrayElements(speaker, spk, 0);
    if (hs) env->ReleaseFloatArrayElements(headset, hs, 0);
    return 0;
}

}  // extern "C"
