// SPDX-License-Identifier: Apache-2.0
/* The per-process instance registry: 20 slots, the registry lock and the teardown sweeps. */
#include "jni/jni_internal.h"
#include "kova/kova_engine.h"
#include "util/kova_mem.h"

extern "C" {
KovaInfo pKOVAInfo[KOVA_MAX_INSTANCES];
int32_t pKOVAInfoIsInited;
pthread_mutex_t* gpKovaMutex;
}

namespace kova_jni {

namespace {

constexpr KovaInfo kFreeSlot{-1, nullptr, 0};

void free_slot(KovaInfo& slot) {
    slot = kFreeSlot;
}

}  // namespace

std::mutex& registry_gate() {
    // Constant-initialised and never destroyed before the library's last call.
    static std::mutex gate;
    return gate;
}

RegistryLock::RegistryLock(bool lock_now) : gate_(registry_gate()) {
    if (lock_now) lock();
}

RegistryLock::~RegistryLock() {
    if (held_) pthread_mutex_unlock(held_);
}

void RegistryLock::lock() {
    if (held_ || !gpKovaMutex) return;
    held_ = gpKovaMutex;
    pthread_mutex_lock(held_);
}

void RegistryLock::unlock_and_destroy() {
    if (held_) {
        pthread_mutex_unlock(held_);
        held_ = nullptr;
    }
    // Holding the gate, this thread is the only library caller that can see the mutex.
    if (pthread_mutex_t* m = gpKovaMutex) {
        gpKovaMutex = nullptr;
        pthread_mutex_destroy(m);
        kova_mem_free(m);
    }
}

void registry_init_slots() {
    for (KovaInfo& slot : pKOVAInfo) free_slot(slot);
    pKOVAInfoIsInited = 1;
}

void registry_create_lock() {
    if (gpKovaMutex) return;
    auto* m = static_cast<pthread_mutex_t*>(kova_mem_malloc(sizeof(pthread_mutex_t)));
    if (!m) return;
    pthread_mutex_init(m, nullptr);
    gpKovaMutex = m;
}

KovaInstance* registry_instance(jlong id) {
    if (id < 1 || id > KOVA_MAX_INSTANCES) return nullptr;
    return pKOVAInfo[id - 1].pInstance;
}

void instance_release_io(KovaInstance* inst) {
    kova_close_fasttrack(inst->pFastTrack, 1);
    inst->pFastTrack = nullptr;
    if (inst->pcm.data) {
        kova_mem_free(inst->pcm.data);
        inst->pcm.data = nullptr;
    }
}

namespace {

enum class Sweep { all, by_pid };

/*
 * The teardown sweep of _KovaInfoDelAll and _KovaInfoDelbyPid. Both are meant for unload and
 * process-exit paths and must not block: they try the registry lock once and go on without it
 * when it is busy, and they unlock only a lock that their own try obtained.
 *
 * When the gate is busy, another library call is in flight on some thread (possibly this one, if
 * we run from a signal handler that interrupted it) and may be about to destroy gpKovaMutex, so
 * the pointer is not touched at all and the lock counts as busy. Waiting instead could deadlock
 * exactly in that interrupted-call case; skipping would leave the streams of a dying process
 * playing. Running unlocked is therefore the choice, and keeping other calls out of the way is
 * the caller's part (no Java call may run concurrently with these teardowns).
 */
void sweep(Sweep kind, int pid) {
    std::unique_lock<std::mutex> gate(registry_gate(), std::try_to_lock);
    pthread_mutex_t* taken = nullptr;
    if (gate.owns_lock() && gpKovaMutex && pthread_mutex_trylock(gpKovaMutex) == 0) {
        taken = gpKovaMutex;
    }
    if (kind == Sweep::all) KOVA_JNI_LOG("_KovaInfoDelAll()");

    int last = KOVA_ERR_INVALID_PARAM;
    for (int i = 0; i < KOVA_MAX_INSTANCES; ++i) {
        KovaInfo& slot = pKOVAInfo[i];
        if (slot.isUsed != 1 || !slot.pInstance) continue;
        if (kind == Sweep::by_pid && slot.pid != pid) continue;
        KovaInstance* inst = slot.pInstance;
        instance_release_io(inst);
        if (!inst->pCtx) {
            if (kind == Sweep::all) {
                KOVA_JNI_LOG("kova_deinit(pid) is failed. error=%d(all)", last);
            } else {
                KOVA_JNI_LOG("kova_deinit(pid) is failed. error=%d(sig)", last);
            }
            continue;
        }
        KOVA_CTX* ctx = inst->pCtx;
        last = kova_deinit(ctx);
        const long slot_pid = slot.pid;
        const long ctx_value = static_cast<long>(reinterpret_cast<intptr_t>(ctx));
        if (last >= 0) {
            if (kind == Sweep::all) {
                KOVA_JNI_LOG("kova_deinit[%d](pid:%ld) is finished successfully(all)", i, slot_pid);
            } else {
                KOVA_JNI_LOG("kova_deinit[%d](id:%ld/pid:%ld) is finished successfully(sig)", i,
                             ctx_value, slot_pid);
            }
            kova_mem_free(inst);
            free_slot(slot);
        } else if (kind == Sweep::all) {
            KOVA_JNI_LOG("kova_deinit[%d](pid:%ld) is already completed(all)", i, slot_pid);
        } else {
            KOVA_JNI_LOG("kova_deinit[%d](id:%ld/pid:%ld) is already completed(sig)", i, ctx_value,
                         slot_pid);
        }
    }

    if (taken) pthread_mutex_unlock(taken);
}

}  // namespace

}  // namespace kova_jni

int _KovaInfoGetIndex() {
    if (!pKOVAInfoIsInited) {
        kova_jni::registry_init_slots();
        return 0;
    }
    for (int i = 0; i < KOVA_MAX_INSTANCES; ++i) {
        if (pKOVAInfo[i].isUsed == 0) return i;
    }
    KOVA_JNI_LOG("KOVA instance MAX");
    return -1;
}

int _KovaInfoAdd(int pid, void* instance) {
    if (!pKOVAInfoIsInited) kova_jni::registry_init_slots();
    const int index = _KovaInfoGetIndex();
    if (index < 0) return -1;
    pKOVAInfo[index] = KovaInfo{pid, static_cast<KovaInstance*>(instance), 1};
    return index;
}

void _KovaInfoDelAll() {
    kova_jni::sweep(kova_jni::Sweep::all, 0);
}

void _KovaInfoDelbyPid(int pid) {
    kova_jni::sweep(kova_jni::Sweep::by_pid, pid);
}

void _KovaInfoDelbyKova(void* instance) {
    for (KovaInfo& slot : pKOVAInfo) {
        if (slot.isUsed == 1 && slot.pInstance == instance) kova_jni::free_slot(slot);
    }
}
