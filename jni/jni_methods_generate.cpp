// SPDX-License-Identifier: Apache-2.0
/* Java methods that generate sound for a motion event and start or stop the output stream. */
#include "jni/jni_entries.h"
#include "jni/jni_internal.h"
#include "kova/kova_engine.h"

using kova_jni::RegistryLock;

namespace {

KOVA_PARAM make_param(jfloat x, jfloat y, jlong time, jfloat aux, jint action) {
    return KOVA_PARAM{x, y, time, aux, static_cast<uint32_t>(action)};
}

}  // namespace

extern "C" {

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_gen_1sounds(JNIEnv* env, jclass /*cls*/,
                                                               jlong id, jbyteArray out, jfloat x,
                                                               jfloat y, jlong time, jfloat aux,
                                                               jint action) {
    RegistryLock frame;
    // A null array is answered with 0 bytes instead of handing null to the VM.
    if (!out) return 0;
    const jsize length = env->GetArrayLength(out);
    jbyte* bytes = env->GetByteArrayElements(out, nullptr);
    KovaInstance* inst = kova_jni::registry_instance(id);
    int32_t result = 0;
    if (length >= 1 && bytes && inst && inst->pCtx) {
        const KOVA_PARAM param = make_param(x, y, time, aux, action);
        KOVA_PCMBUF pcm{reinterpret_cast<int16_t*>(bytes), length};
        result = kova_gen_sounds(inst->pCtx, &param, &pcm);
    }
    if (bytes) env->ReleaseByteArrayElements(out, bytes, 0);
    return result;
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_gen_1tofasttrack(JNIEnv* /*env*/, jclass /*cls*/,
                                                                    jlong id, jfloat x, jfloat y,
                                                                    jlong time, jfloat aux,
                                                                    jint action) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (!inst) return 0;
    const KOVA_PARAM param = make_param(x, y, time, aux, action);
    if (!inst->pCtx || !inst->pcm.data) return 0;
    const int32_t n = kova_gen_sounds(inst->pCtx, &param, &inst->pcm);
    // All or nothing: a block that does not fit the ring buffer is dropped, never waited for.
    kova_write_fasttrack(inst->pFastTrack, inst->pcm.data, static_cast<uint32_t>(inst->pcm.size),
                         static_cast<uint32_t>(n));
    return n;
}

JNIEXPORT void JNICALL Java_com_corvane_audio_Kova_stop_1fasttrack(JNIEnv* /*env*/, jclass /*cls*/,
                                                                   jlong id) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (inst && inst->pFastTrack) kova_stop_fasttrack(inst->pFastTrack);
}

JNIEXPORT void JNICALL Java_com_corvane_audio_Kova_start_1fasttrack(JNIEnv* /*env*/, jclass /*cls*/,
                                                                    jlong id) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (inst && inst->pFastTrack) kova_start_fasttrack(inst->pFastTrack);
}

}  // extern "C"
