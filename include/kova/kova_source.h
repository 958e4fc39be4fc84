/* Sound sources: the source model, PCM loading, the file-access layer, the source-set file and
 * the file queries. */
#ifndef KOVA_SOURCE_H
#define KOVA_SOURCE_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/* Source model. */
KOVA_API void kova_free_sourceobj(KOVA_SRC* src);
KOVA_API void kova_free_sourceset(void* set); /* KOVA_SRCSET*, shaped as a list release function */
KOVA_API int kova_update_filterdsc(LIST* filters, const KOVA_FLT_DSC* dsc);
KOVA_API int kova_is_valid_filter(const KOVA_FLT_DSC* dsc);

/* Loading raw PCM files. */
KOVA_API KOVA_SRC* kova_load_sound_source(const char* path, int slot, int* err);
KOVA_API int kova_read_source_file(const char* path, void* buf, int capacity);

/* File access layer. The eight operations are reached only through an initialised object. */
KOVA_API int tarq_mfal_init(const char* path, TARQ_MFAL* mfal);

/* Record readers and writers: (open handle, access object, record). */
KOVA_API int _write_flt_size(void* h, TARQ_MFAL* mfal, int32_t count);
KOVA_API int _read_flt_size(void* h, TARQ_MFAL* mfal, int32_t* count);
KOVA_API int _write_KOVA_FLT_DSC(void* h, TARQ_MFAL* mfal, const KOVA_FLT_DSC* dsc);
KOVA_API int _read_KOVA_FLT_DSC(void* h, TARQ_MFAL* mfal, KOVA_FLT_DSC* dsc);
KOVA_API int _write_KOVA_TUNE_SET(void* h, TARQ_MFAL* mfal, const KOVA_TUNE_SET* tune);
KOVA_API int _read_KOVA_TUNE_SET(void* h, TARQ_MFAL* mfal, KOVA_TUNE_SET* tune);
KOVA_API int _write_KOVA_SRC_INFO(void* h, TARQ_MFAL* mfal, const KOVA_SRC_INFO* info);
KOVA_API int _read_KOVA_SRC_INFO(void* h, TARQ_MFAL* mfal, KOVA_SRC_INFO* info);
KOVA_API int _write_KOVA_SRC(void* h, TARQ_MFAL* mfal, const KOVA_SRC* src);
KOVA_API KOVA_SRC* _read_KOVA_SRC(void* h, TARQ_MFAL* mfal);

/* Whole source-set files. */
KOVA_API int kova_write_srcset(int sample_rate, int channels, KOVA_SRCSET* set, TARQ_MFAL* mfal,
                               void* h);
KOVA_API int kova_open_source(KOVA_SRCSET* set, const char* path);

/* Queries on a saved file, without an engine. */
KOVA_API int kova_get_pcminfo_fromfile(const char* path, int* start_off, int* start_size,
                                       int* loop_off, int* loop_size, int* end_off, int* end_size);
KOVA_API int kova_get_filters_fromfile(const char* path, KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT]);
KOVA_API int kova_get_tuneset_fromfile(const char* path, KOVA_TUNE_SET* tune);
KOVA_API int kova_get_rptinfo_fromfile(const char* path, KOVA_RPT_INFO* info);

KOVA_EXTERN_C_END

#endif
