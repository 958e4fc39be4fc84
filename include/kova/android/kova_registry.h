// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_registry.h
 * @brief Per-process instance registry behind the Java class `com.corvane.audio.Kova`.
 *
 * C++ and platform-only; include it as `<kova/android/kova_registry.h>`. An instance bundles an
 * engine context, a 960000-byte PCM buffer and an output stream; Java names it by an id, the
 * slot index + 1 (1 to ::KOVA_MAX_INSTANCES).
 *
 * @par Threading
 * The registry lock ::gpKovaMutex serialises every Java method that touches an instance and with
 * it every engine call made for it. The registry functions below take no lock except
 * _KovaInfoDelAll() and _KovaInfoDelbyPid(), which try it without waiting and go on either way;
 * callers of the others hold the lock. Lock order: the registry lock first, then a stream's or a
 * context's mutex.
 *
 * @par Real time
 * The registry functions allocate nothing; the deleting ones close streams (joining their
 * callback threads) and free instances.
 */
#ifndef KOVA_REGISTRY_H
#define KOVA_REGISTRY_H

#include "kova_fasttrack.h"
#include "../kova_types.h"

#define KOVA_MAX_INSTANCES 20          /**< Registry slots: instances one process may hold. */
#define KOVA_INSTANCE_PCM_BYTES 960000 /**< Size of an instance's PCM buffer. */

/** One instance, owned by its registry slot. */
struct KovaInstance {
    KOVA_CTX* pCtx;             /**< The engine context, owned; null until created. */
    KOVA_FORMAT format;         /**< The format block from Java `init`, handed to kova_init(). */
    int32_t curSrc;             /**< The set identifier last given to Java `set_src`; 0 at first. */
    KOVA_PCMBUF pcm;            /**< The ::KOVA_INSTANCE_PCM_BYTES generation buffer, owned. */
    KOVA_FASTTRACK* pFastTrack; /**< The output stream, owned. */
};

/** One registry slot. */
struct KovaInfo {
    int32_t pid;             /**< Process id of the `init` caller; -1 when free. */
    KovaInstance* pInstance; /**< The instance; null when free. */
    int32_t isUsed;          /**< 1 in use, 0 free. */
};

extern "C" {
KOVA_API extern KovaInfo pKOVAInfo[KOVA_MAX_INSTANCES]; /**< The registry: slot i is id i + 1. */
/** 0 at load; 1 once the slots have their free values. */
KOVA_API extern int32_t pKOVAInfoIsInited;
/** The registry lock (default attributes), or null while none exists: created at load or by the
 * next Java `init`, destroyed by every Java `deinit` that found an instance. */
KOVA_API extern pthread_mutex_t* gpKovaMutex;
}

/* C++ linkage: the parameter types are part of the exported symbols. */

/**
 * Finds the first free slot (initialising the registry on first use). Takes no lock.
 * @return the slot index, 0 to 19; -1 when all are in use.
 */
KOVA_API int _KovaInfoGetIndex();

/**
 * Enters an instance into the first free slot. Takes no lock.
 * @param pid the process id of the caller.
 * @param instance the ::KovaInstance; the slot takes it over.
 * @return the slot index used, or -1 when all are in use (nothing changed).
 */
KOVA_API int _KovaInfoAdd(int pid, void* instance);

/**
 * Tears down every registered instance (stream, buffer, engine) and frees its slot; a slot whose
 * engine refuses the teardown stays. Tries the registry lock without waiting.
 */
KOVA_API void _KovaInfoDelAll();

/**
 * Tears down the instances entered by one process, as _KovaInfoDelAll() does.
 * @param pid the process id.
 */
KOVA_API void _KovaInfoDelbyPid(int pid);

/**
 * Frees the slots that hold an instance, without closing or freeing anything. Takes no lock.
 * @param instance the ::KovaInstance.
 */
KOVA_API void _KovaInfoDelbyKova(void* instance);

#endif
