# SPDX-License-Identifier: Apache-2.0
# Cross build for 64-bit Arm Linux with Debian's aarch64-linux-gnu GCC. Binaries run on an x86-64
# host through qemu-user (tests and test discovery go through CMAKE_CROSSCOMPILING_EMULATOR).
# Needs: g++-aarch64-linux-gnu, qemu-user and the :arm64 builds of android-liblog-dev,
# android-libutils-dev and libgtest-dev (multiarch, installed by scripts/setup.sh).
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(CMAKE_LIBRARY_ARCHITECTURE aarch64-linux-gnu)

set(CMAKE_C_COMPILER aarch64-linux-gnu-gcc)
set(CMAKE_CXX_COMPILER aarch64-linux-gnu-g++)

# The cross toolchain's own sysroot holds libc and libstdc++; the multiarch directories of the host
# (/usr/lib/aarch64-linux-gnu, reached through the root "/") hold liblog, libutils and gtest.
set(CMAKE_FIND_ROOT_PATH /usr/aarch64-linux-gnu /)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# libbacktrace:arm64 (behind libutils) needs 7z.so, which Debian has only for the host
# architecture; a stub of our own takes its place at link time and under qemu (see
# aarch64-7z-stub.c).
set(KOVA_AARCH64_STUBS ${CMAKE_BINARY_DIR}/aarch64-stubs)
if(NOT EXISTS ${KOVA_AARCH64_STUBS}/7z.so)
    file(MAKE_DIRECTORY ${KOVA_AARCH64_STUBS})
    execute_process(
        COMMAND aarch64-linux-gnu-gcc -shared -fPIC -O2 -o ${KOVA_AARCH64_STUBS}/7z.so
                ${CMAKE_CURRENT_LIST_DIR}/aarch64-7z-stub.c
        RESULT_VARIABLE KOVA_STUB_RESULT)
    if(NOT KOVA_STUB_RESULT EQUAL 0)
        message(FATAL_ERROR "cannot build the AArch64 7z.so stub")
    endif()
endif()
# A directory link option rather than *_LINKER_FLAGS_INIT, which only a first configure reads.
add_link_options(-Wl,-rpath-link,${KOVA_AARCH64_STUBS})

# Binaries run against the multiarch arm64 runtime (libc6:arm64, libstdc++6:arm64, installed with
# the arm64 packages), loader included: qemu's prefix is "/". The cross toolchain's own copy of
# libc under /usr/aarch64-linux-gnu may be an older release than libc6:arm64, and a loader of one
# release with a libc of another hangs in the first pthread_create.
find_program(KOVA_QEMU_AARCH64 qemu-aarch64 REQUIRED)
set(CMAKE_CROSSCOMPILING_EMULATOR ${KOVA_QEMU_AARCH64} -L /
                                  -E LD_LIBRARY_PATH=${KOVA_AARCH64_STUBS})

# The library uses only the JNI headers, which are the same for every 64-bit Linux; no arm64 JVM is
# needed. Point FindJNI at the host JDK's headers and give it placeholders for the libraries it
# insists on finding (nothing links them; builds that need a JVM stay off in this configuration).
file(GLOB KOVA_HOST_JDK_INCLUDE LIST_DIRECTORIES true /usr/lib/jvm/java-17-openjdk-*/include)
list(GET KOVA_HOST_JDK_INCLUDE 0 KOVA_HOST_JDK_INCLUDE)
set(JAVA_INCLUDE_PATH ${KOVA_HOST_JDK_INCLUDE} CACHE PATH "")
set(JAVA_INCLUDE_PATH2 ${KOVA_HOST_JDK_INCLUDE}/linux CACHE PATH "")
set(JAVA_AWT_INCLUDE_PATH ${KOVA_HOST_JDK_INCLUDE} CACHE PATH "")
set(JAVA_JVM_LIBRARY KOVA_NO_JVM_WHEN_CROSS_BUILDING CACHE STRING "")
set(JAVA_AWT_LIBRARY KOVA_NO_JVM_WHEN_CROSS_BUILDING CACHE STRING "")
set(KOVA_CROSS_NO_JVM ON CACHE BOOL "Cross build: no JVM for the target")

# The AOSP headers are third-party code: treat them as system headers so that the cross compiler's
# warnings about them (e.g. an unused constant in StrongPointer.h) do not trip -Werror. With both
# -I and -isystem given for one directory, GCC uses -isystem.
set(CMAKE_C_FLAGS_INIT "-isystem /usr/include/android")
set(CMAKE_CXX_FLAGS_INIT "-isystem /usr/include/android")
