// SPDX-License-Identifier: Apache-2.0
/* Java methods that register and select sources and set tuning, thickness and volume. */
#include "jni/jni_entries.h"
#include "jni/jni_internal.h"
#include "kova/kova_engine.h"

using kova_jni::RegistryLock;

namespace {

/* Modified-UTF-8 characters of a Java string, released on every path; null stays null. */
class UtfChars {
   public:
    UtfChars(JNIEnv* env, jstring s)
        : env_(env), str_(s), chars_(s ? env->GetStringUTFChars(s, nullptr) : nullptr) {}
    ~UtfChars() {
        if (chars_) env_->ReleaseStringUTFChars(str_, chars_);
    }
    UtfChars(const UtfChars&) = delete;
    UtfChars& operator=(const UtfChars&) = delete;
    const char* get() const { return chars_; }

   private:
    JNIEnv* env_;
    jstring str_;
    const char* chars_;
};

}  // namespace

extern "C" {

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_reg_1src_1byfiles(JNIEnv* env, jclass /*cls*/,
                                                                     jlong id, jstring start,
                                                                     jstring loop, jstring end) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (!inst) return KOVA_ERR_INVALID_PARAM;

    const UtfChars start_path(env, start);
    const UtfChars loop_path(env, loop);
    const UtfChars end_path(env, end);
    if (!inst->pCtx) return 0;

    const char* const paths[KOVA_SLOT_COUNT] = {start_path.get(), loop_path.get(), end_path.get()};
    int32_t err = KOVA_ERR_INVALID_PARAM;
    const int32_t result = kova_reg_src_byfiles(inst->pCtx, paths, &err);
    if (result > 0) {
        KOVA_JNI_LOG("kova_reg_src (%d, idx:%d)", static_cast<int>(id), result);
    } else {
        KOVA_JNI_LOG("kova_reg_src () is failed. error=%d", err);
    }
    return result;
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1src(JNIEnv* /*env*/, jclass /*cls*/,
                                                            jlong id, jint index) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (!inst || !inst->pCtx || index == inst->curSrc) return KOVA_ERR_INVALID_PARAM;
    const int32_t result = kova_set_active_src(inst->pCtx, index);
    KOVA_JNI_LOG("kova_set_actiive_src (%d, active%d)", static_cast<int>(id), index);
    // Recorded even when the engine refused it, so the same request is not sent twice.
    inst->curSrc = index;
    return result;
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_get_1src_1num(JNIEnv* /*env*/, jclass /*cls*/,
                                                                 jlong id) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (!inst || !inst->pCtx) return 0;
    return kova_get_src_num(inst->pCtx);
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1tuneset(
    JNIEnv* /*env*/, jclass /*cls*/, jlong id, jint index, jdouble gain, jdouble pan,
    jint osc_enable, jdouble osc_depth, jint sharp_enable, jdouble sharpness, jdouble wn_gain,
    jdouble file_gain, jdouble start_gain, jdouble loop_gain, jdouble end_gain) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (!inst) return KOVA_ERR_INVALID_PARAM;
    const KOVA_TUNE_SET tune{gain,    pan,       osc_enable, osc_depth, sharp_enable, sharpness,
                             wn_gain, file_gain, start_gain, loop_gain, end_gain};
    if (!inst->pCtx) return KOVA_ERR_INVALID_PARAM;
    const int32_t result = kova_set_tuneset(inst->pCtx, index, &tune);
    KOVA_JNI_LOG("kova_set_tuneset(%d,%f,%f,(%d,%f),(%d,%f),%f,%f,%f,%f,%f)", static_cast<int>(id),
                 tune.gain, tune.pan, tune.osc_enable, tune.osc_depth, tune.sharp_enable,
                 tune.sharpness, tune.wn_gain, tune.file_gain, tune.start_gain, tune.loop_gain,
                 tune.end_gain);
    return result;
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1thickness(JNIEnv* /*env*/, jclass /*cls*/,
                                                                  jlong id, jdouble thickness) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (!inst) return KOVA_ERR_INVALID_PARAM;
    if (!inst->pCtx) {
        KOVA_JNI_LOG("kova_set_thickness() is failed. (ID is NULL)");
        return KOVA_ERR_INVALID_PARAM;
    }
    const int32_t result = kova_set_thickness(inst->pCtx, thickness);
    if (result == 0) {
        KOVA_JNI_LOG("kova_set_thickness(%d,%f)", static_cast<int>(id), thickness);
    } else {
        KOVA_JNI_LOG("kova_set_thickness(%d) is failed. (err : %d)", static_cast<int>(id), result);
    }
    return result;
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_set_1volume(JNIEnv* /*env*/, jclass /*cls*/,
                                                               jlong id, jdouble volume) {
    RegistryLock frame;
    KovaInstance* inst = kova_jni::registry_instance(id);
    if (!inst) return KOVA_ERR_INVALID_PARAM;
    if (!inst->pCtx) {
        KOVA_JNI_LOG("kova_set_volume() is failed. (ID is NULL)");
        return KOVA_ERR_INVALID_PARAM;
    }
    const int32_t result = kova_set_volume(inst->pCtx, volume);
    if (result == 0) {
        KOVA_JNI_LOG("kova_set_volume(%d,%f)", static_cast<int>(id), volume);
    } else {
        KOVA_JNI_LOG("kova_set_volume(%d) is failed. (err : %d)", static_cast<int>(id), result);
    }
    return result;
}

}  // extern "C"
