/* libKovaFastTrack: the whole C interface. */
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
