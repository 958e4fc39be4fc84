// SPDX-License-Identifier: Apache-2.0
/* Internals shared by the registry and the Java native methods. Not exported. */
#ifndef KOVA_JNI_INTERNAL_H
#define KOVA_JNI_INTERNAL_H

#include <android/log.h>
#include <jni.h>

#include <mutex>

#include "kova/android/kova_registry.h"

#define KOVA_JNI_TAG "kova_jni"
#define KOVA_JNI_LOG(...) __android_log_print(ANDROID_LOG_INFO, KOVA_JNI_TAG, __VA_ARGS__)

namespace kova_jni {

/*
 * Serialisation of the registry.
 *
 * gpKovaMutex is the registry lock that the outside world sees: it exists from load (or from the
 * next init) until a deinit that found an instance destroys it. Because that deinit frees the
 * mutex while other Java threads may already be queued for the registry, library calls never
 * queue on gpKovaMutex itself. Each call first takes the gate, a hidden process-wide mutex that is
 * never destroyed, and only then locks gpKovaMutex (when one exists). So:
 *   - every thread that waits, waits on the gate, never on a mutex that may be destroyed;
 *   - while a call holds the gate no other library call can hold, lock or destroy gpKovaMutex, so
 *     deinit can unlock, destroy and free it without stranding anyone, and the next call reads
 *     the pointer afresh (null, or the new lock of a later init);
 *   - calls stay serialised even while no registry lock exists, so "running without a lock"
 *     never means two engine calls run at the same time.
 * The pointer gpKovaMutex is only read or written by a thread holding the gate.
 */
std::mutex& registry_gate();

/* The registry frame of one Java call: gate, then the registry lock if one exists. */
class RegistryLock {
   public:
    /* Takes the gate; with lock_now, also the registry lock. */
    explicit RegistryLock(bool lock_now = true);
    ~RegistryLock();
    RegistryLock(const RegistryLock&) = delete;
    RegistryLock& operator=(const RegistryLock&) = delete;

    /* Locks gpKovaMutex if it exists and this frame does not hold it yet. */
    void lock();
    /* Unlocks the registry lock, destroys and frees it and clears gpKovaMutex. */
    void unlock_and_destroy();

   private:
    std::unique_lock<std::mutex> gate_;
    pthread_mutex_t* held_ = nullptr;
};

/* Gives all slots their free values and marks the registry initialised. */
void registry_init_slots();
/* Creates the registry lock when none exists; on allocation failure none exists. */
void registry_create_lock();
/* The instance of a Java id (1..20), or null for an id out of range or a free slot. */
KovaInstance* registry_instance(jlong id);
/* Closes the output stream and frees the PCM buffer of an instance (the engine context stays). */
void instance_release_io(KovaInstance* inst);

}  // namespace kova_jni

#endif
