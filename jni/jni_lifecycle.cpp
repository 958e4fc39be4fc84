// SPDX-License-Identifier: Apache-2.0
/* Library load and unload hooks and the Java methods that create and destroy an instance. */
#include <unistd.h>

#include "jni/jni_entries.h"
#include "jni/jni_internal.h"
#include "kova/kova_engine.h"
#include "util/kova_mem.h"

using kova_jni::RegistryLock;

namespace {

constexpr int32_t kFastTrackRate = 48000;
constexpr int32_t kFastTrackChannels = 2;

/* Releases an instance that never made it into the registry. */
void discard_instance(KovaInstance* inst) {
    kova_jni::instance_release_io(inst);
    if (inst->pCtx) kova_deinit(inst->pCtx);
    kova_mem_free(inst);
}

}  // namespace

extern "C" {

JNIEXPORT jint JNICALL JNI_OnLoad(JavaVM* vm, void* /*reserved*/) {
    void* env = nullptr;
    if (!vm || vm->GetEnv(&env, JNI_VERSION_1_6) != JNI_OK) return JNI_ERR;
    RegistryLock frame(false);
    kova_jni::registry_create_lock();
    if (!pKOVAInfoIsInited) {
        kova_jni::registry_init_slots();
        KOVA_JNI_LOG("KOVA_JNI_OnLoad(init)");
    } else {
        KOVA_JNI_LOG("KOVA_JNI_OnLoad()");
    }
    return JNI_VERSION_1_6;
}

JNIEXPORT void JNICALL JNI_OnUnload(JavaVM* /*vm*/, void* /*reserved*/) {
    KOVA_JNI_LOG("KOVA_JNI_OnUnload()");
    _KovaInfoDelAll();
}

JNIEXPORT jlong JNICALL Java_com_corvane_audio_Kova_init(JNIEnv* /*env*/, jclass /*cls*/,
                                                         jint sample_rate, jint channels, jint p,
                                                         jint w, jint h) {
    RegistryLock frame(false);
    kova_jni::registry_create_lock();
    KOVA_JNI_LOG("kova_init()");
    frame.lock();

    if (_KovaInfoGetIndex() < 0) return 0;

    // No memory for the record is answered like no memory for its buffer: 0, nothing kept.
    auto* inst = static_cast<KovaInstance*>(kova_mem_calloc(1, sizeof(KovaInstance)));
    if (!inst) return 0;
    inst->pcm.data = static_cast<int16_t*>(kova_mem_malloc(KOVA_INSTANCE_PCM_BYTES));
    if (!inst->pcm.data) {
        kova_mem_free(inst);
        return 0;
    }
    inst->pcm.size = KOVA_INSTANCE_PCM_BYTES;
    inst->pFastTrack = kova_open_fasttrack(kFastTrackRate, kFastTrackChannels);
    if (!inst->pFastTrack) {
        kova_mem_free(inst->pcm.data);
        kova_mem_free(inst);
        return 0;
    }

    inst->format =
        KOVA_FORMAT{static_cast<uint32_t>(sample_rate), static_cast<uint32_t>(channels),
                    static_cast<uint32_t>(p), static_cast<uint32_t>(w), static_cast<uint32_t>(h)};
    inst->curSrc = 0;

    int32_t err = KOVA_ERR_INVALID_PARAM;
    inst->pCtx = kova_init(&inst->format, &err);
    if (!inst->pCtx) {
        KOVA_JNI_LOG("kova_init() is failed. error=%d", err);
        discard_instance(inst);
        return -1;
    }

    // Holding the gate, the slot found above is still free; the refusal path is defensive only.
    const int index = _KovaInfoAdd(getpid(), inst);
    if (index < 0) {
        KOVA_JNI_LOG("kova_init(index:%d) is failed. error=%d", 0, err);
        discard_instance(inst);
        return 0;
    }

    const int id = index + 1;
    const KOVA_FORMAT& f = inst->format;
    KOVA_JNI_LOG("kova_init(id:%d,%dhz,%dch,p:%d,w:%d,h:%d)", id, static_cast<int>(f.sample_rate),
                 static_cast<int>(f.channels), static_cast<int>(f.p), static_cast<int>(f.w),
                 static_cast<int>(f.h));
    return id;
}

JNIEXPORT jint JNICALL Java_com_corvane_audio_Kova_deinit(JNIEnv* /*env*/, jclass /*cls*/,
                                                          jlong id) {
    KOVA_JNI_LOG("kova_deinit()");
    RegistryLock frame;
    if (id < 1 || id > KOVA_MAX_INSTANCES) return KOVA_ERR_INVALID_PARAM;
    KovaInfo& slot = pKOVAInfo[id - 1];
    KovaInstance* inst = slot.pInstance;
    if (!inst) {
        KOVA_JNI_LOG("instance is NULL. deinit() is failed.");
        return 0;
    }

    kova_jni::instance_release_io(inst);
    int32_t result = KOVA_ERR_INVALID_PARAM;
    if (!inst->pCtx) {
        KOVA_JNI_LOG("kova_deinit() is failed. error=%d", result);
    } else {
        result = kova_deinit(inst->pCtx);
        if (result >= 0) {
            KOVA_JNI_LOG("kova_deinit(id:%d, pid:%d)", static_cast<int>(id), slot.pid);
            inst->pCtx = nullptr;
            _KovaInfoDelbyKova(inst);
            kova_mem_free(inst);
        } else {
            // The slot keeps the record (without stream and buffer) so a later deinit retries.
            KOVA_JNI_LOG("kova_deinit(id:%d) is already completed", static_cast<int>(id));
        }
    }
    frame.unlock_and_destroy();
    return result;
}

}  // extern "C"
