# SPDX-License-Identifier: Apache-2.0
# Install rules and packages: the library (and, off Android, the AudioTrack stand-in it links),
# the public headers, a CMake package exporting KovaFastTrack::KovaFastTrack, and a pkg-config
# file. The jar is installed by java/CMakeLists.txt.
include(CMakePackageConfigHelpers)

set(KOVA_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/KovaFastTrack)

# The installed library finds the stand-in beside itself and Debian's AOSP liblog and libutils in
# their private folder; nothing points into the build tree.
if(NOT ANDROID)
    set(KOVA_INSTALL_RPATH "\$ORIGIN" ${KOVA_ANDROID_LIBDIR})
    set_target_properties(KovaFastTrack kova_host_audio PROPERTIES INSTALL_RPATH "${KOVA_INSTALL_RPATH}")
    set_target_properties(kova_host_audio PROPERTIES
        VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
    # In the export set because the library links it; programs do not link it themselves.
    set(KOVA_INSTALL_HOST kova_host_audio)
endif()

install(TARGETS KovaFastTrack ${KOVA_INSTALL_HOST} EXPORT KovaFastTrackTargets
    LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
    INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(DIRECTORY ${PROJECT_SOURCE_DIR}/include/kova DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}
    FILES_MATCHING PATTERN "*.h")

install(EXPORT KovaFastTrackTargets NAMESPACE KovaFastTrack:: DESTINATION ${KOVA_CMAKE_DIR})
configure_package_config_file(${PROJECT_SOURCE_DIR}/cmake/KovaFastTrackConfig.cmake.in
    ${PROJECT_BINARY_DIR}/KovaFastTrackConfig.cmake INSTALL_DESTINATION ${KOVA_CMAKE_DIR})
write_basic_package_version_file(${PROJECT_BINARY_DIR}/KovaFastTrackConfigVersion.cmake
    COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/KovaFastTrackConfig.cmake
    ${PROJECT_BINARY_DIR}/KovaFastTrackConfigVersion.cmake DESTINATION ${KOVA_CMAKE_DIR})

# pkg-config: paths relative to the .pc file, so an install moved to another prefix still works.
file(RELATIVE_PATH KOVA_PC_TO_PREFIX ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig ${CMAKE_INSTALL_PREFIX})
string(REGEX REPLACE "/$" "" KOVA_PC_TO_PREFIX "${KOVA_PC_TO_PREFIX}")
configure_file(${PROJECT_SOURCE_DIR}/cmake/KovaFastTrack.pc.in
    ${PROJECT_BINARY_DIR}/KovaFastTrack.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/KovaFastTrack.pc
    DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
install(FILES ${PROJECT_SOURCE_DIR}/LICENSE DESTINATION ${CMAKE_INSTALL_DOCDIR})
