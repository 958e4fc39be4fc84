// SPDX-License-Identifier: Apache-2.0
/**
 * @file kova_version.h
 * @brief Version of the libKovaFastTrack headers.
 *
 * The macros describe the headers a program was compiled with. The shared library's SONAME
 * carries the major version (`libKovaFastTrack.so.1`): programs built against one major version
 * run with every later release of that major version. The build checks that these numbers equal
 * the project version in CMakeLists.txt.
 */
#ifndef KOVA_VERSION_H
#define KOVA_VERSION_H

/** Major version: changes when the exported interface changes incompatibly (and the SONAME). */
#define KOVA_VERSION_MAJOR 1
/** Minor version: changes when compatible features are added. */
#define KOVA_VERSION_MINOR 0
/** Patch version: changes for fixes that keep the interface. */
#define KOVA_VERSION_PATCH 0
/** The version as a string literal, "MAJOR.MINOR.PATCH". */
#define KOVA_VERSION_STRING "1.0.0"

#endif /* KOVA_VERSION_H */
