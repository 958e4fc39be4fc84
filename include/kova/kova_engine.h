/* The synthesis engine: context lifecycle, generation, registration, tuning, repeat information
 * and saving. Every operation takes the context first; set identifiers are 1-based. */
#ifndef KOVA_ENGINE_H
#define KOVA_ENGINE_H

#include "kova_types.h"

KOVA_EXTERN_C_BEGIN

/* Lifecycle. */
KOVA_API int32_t kova_checkformat(const KOVA_FORMAT* f);
KOVA_API KOVA_CTX* kova_init(const KOVA_FORMAT* f, int32_t* err);
KOVA_API int32_t kova_deinit(KOVA_CTX* ctx);

/* Generation. */
KOVA_API int32_t kova_gen_sounds(KOVA_CTX* ctx, const KOVA_PARAM* param, KOVA_PCMBUF* out);
KOVA_API int32_t kova_gen_samples(KOVA_CTX* ctx, const KOVA_PARAM* param, KOVA_PCMBUF* out);
KOVA_API void kova_set_param(KOVA_PARAM* dst, const KOVA_PARAM* src);
KOVA_API double _calc_envelope(const KOVA_PARAM* prev, const KOVA_PARAM* cur, double* energy,
                               double norm);
KOVA_API double _calc_sharpness(double env, float depth);
KOVA_API double _calc_distortion(double a, double b);

/* Registration and selection. */
KOVA_API int32_t kova_reg_src_byfiles(KOVA_CTX* ctx, const char* const paths[KOVA_SLOT_COUNT],
                                      int32_t* err);
KOVA_API int32_t kova_set_active_src(KOVA_CTX* ctx, int32_t index);
KOVA_API int32_t kova_get_src_num(KOVA_CTX* ctx);
KOVA_API int32_t kova_reg_src_byfilter(KOVA_CTX* ctx, const KOVA_FLT_DSC* dsc, int32_t* err);
KOVA_API int32_t kova_reg_src_bysavefile(KOVA_CTX* ctx, const char* path, int32_t* err);
KOVA_API int32_t kova_update_filter(KOVA_CTX* ctx, int32_t index, const KOVA_FLT_DSC* dsc,
                                    int32_t* err);
KOVA_API int32_t kova_attach_filter(KOVA_CTX* ctx, int32_t index, const KOVA_FLT_DSC* dsc,
                                    int32_t* err);
KOVA_API int32_t kova_get_filters(KOVA_CTX* ctx, int32_t index,
                                  KOVA_FLT_DSC flt[KOVA_FLT_TYPE_COUNT]);
KOVA_API int32_t kova_update_src_byfiles(KOVA_CTX* ctx, int32_t index,
                                         const char* const paths[KOVA_SLOT_COUNT], int32_t* err);

/* Tune set, thickness, volume. */
KOVA_API int32_t kova_get_tuneset(KOVA_CTX* ctx, int32_t index, KOVA_TUNE_SET* out);
KOVA_API int32_t kova_set_tuneset(KOVA_CTX* ctx, int32_t index, const KOVA_TUNE_SET* in);
KOVA_API KOVA_TUNE_SET* _cfg_tune_default(KOVA_TUNE_SET* tune);
KOVA_API int32_t kova_set_thickness(KOVA_CTX* ctx, double thickness);
KOVA_API int32_t kova_set_volume(KOVA_CTX* ctx, double volume);

/* Repeat information. */
KOVA_API int64_t _cvt_byte_to_ms(int32_t bytes, int32_t sample_rate, int32_t channels);
KOVA_API int32_t _cvt_ms_to_byte(int64_t ms, int32_t sample_rate, int32_t channels);
KOVA_API int32_t kova_get_rptinfo(KOVA_CTX* ctx, int32_t index, KOVA_RPT_INFO* info);
KOVA_API int32_t kova_set_rptinfo(KOVA_CTX* ctx, int32_t index, const KOVA_RPT_INFO* info);

/* Saving. */
KOVA_API int32_t kova_save_source(KOVA_CTX* ctx, int32_t index, const char* path);

KOVA_EXTERN_C_END

#endif
