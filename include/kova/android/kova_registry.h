/* Per-process instance registry behind the Java class com.corvane.audio.Kova. */
#ifndef KOVA_REGISTRY_H
#define KOVA_REGISTRY_H

#include "kova_fasttrack.h"
#include "../kova_types.h"

#define KOVA_MAX_INSTANCES 20
#define KOVA_INSTANCE_PCM_BYTES 960000

struct KovaInstance {
    KOVA_CTX* pCtx;
    KOVA_FORMAT format;
    int32_t curSrc;
    KOVA_PCMBUF pcm;
    KOVA_FASTTRACK* pFastTrack;
};

struct KovaInfo {
    int32_t pid;
    KovaInstance* pInstance;
    int32_t isUsed;
};

extern "C" {
KOVA_API extern KovaInfo pKOVAInfo[KOVA_MAX_INSTANCES];
KOVA_API extern int32_t pKOVAInfoIsInited;
KOVA_API extern pthread_mutex_t* gpKovaMutex;
}

/* C++ linkage: the parameter types are part of the exported symbols. */
KOVA_API int _KovaInfoGetIndex();
KOVA_API int _KovaInfoAdd(int pid, void* instance);
KOVA_API void _KovaInfoDelAll();
KOVA_API void _KovaInfoDelbyPid(int pid);
KOVA_API void _KovaInfoDelbyKova(void* instance);

#endif
