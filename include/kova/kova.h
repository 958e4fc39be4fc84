// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova.h
 * @brief The whole C interface of libKovaFastTrack: include this one header.
 *
 * The C++ platform-only parts (the fast-track output stream and the instance registry behind the
 * Java class) are in kova/android/ and are not included here.
 */
#ifndef KOVA_H
#define KOVA_H

#include "kova_version.h"
#include "kova_types.h"
#include "kova_list.h"
#include "kova_dsp.h"
#include "kova_source.h"
#include "kova_engine.h"
#include "kova_output.h"

#endif
