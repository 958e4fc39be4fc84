# SPDX-License-Identifier: Apache-2.0
# kova_docs: the API reference, HTML under <build>/docs/api/html: Doxygen from the public headers
# and docs/api/mainpage.md, the event-path diagram drawn by graphviz from docs/event-path.dot, and
# the Java class's Javadoc under html/java. Any Doxygen or Javadoc warning fails the target, and so
# does an exported function missing from the index.
find_package(Doxygen COMPONENTS dot)
if(NOT DOXYGEN_FOUND OR NOT TARGET Doxygen::dot)
    # A machine without doxygen and graphviz (before scripts/setup.sh) still builds the library.
    message(STATUS "kova_docs not available: doxygen and graphviz (dot) are needed")
    return()
endif()

set(KOVA_DOCS_OUT ${PROJECT_BINARY_DIR}/docs/api)
# The Java class's reference beside it, from javadoc with every doclint check as an error.
find_program(KOVA_JAVADOC javadoc HINTS ${JAVA_HOME}/bin $ENV{JAVA_HOME}/bin REQUIRED)
set(KOVA_JAVA_SOURCE ${PROJECT_SOURCE_DIR}/java/src/com/corvane/audio/Kova.java)
configure_file(${PROJECT_SOURCE_DIR}/docs/api/Doxyfile.in ${KOVA_DOCS_OUT}/Doxyfile @ONLY)
file(GLOB_RECURSE KOVA_PUBLIC_HEADERS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/include/kova/*.h)
set(KOVA_DOCS_INPUTS ${KOVA_PUBLIC_HEADERS} ${PROJECT_SOURCE_DIR}/docs/api/mainpage.md
    ${PROJECT_SOURCE_DIR}/docs/event-path.md ${PROJECT_SOURCE_DIR}/docs/event-path.dot)

add_custom_command(
    OUTPUT ${KOVA_DOCS_OUT}/html/index.html ${KOVA_DOCS_OUT}/xml/index.xml
    COMMAND ${CMAKE_COMMAND} -E rm -rf ${KOVA_DOCS_OUT}/html ${KOVA_DOCS_OUT}/xml
    COMMAND ${CMAKE_COMMAND} -E make_directory ${KOVA_DOCS_OUT}/images
    COMMAND ${DOXYGEN_DOT_EXECUTABLE} -Tsvg ${PROJECT_SOURCE_DIR}/docs/event-path.dot
            -o ${KOVA_DOCS_OUT}/images/event-path.svg
    COMMAND ${DOXYGEN_EXECUTABLE} ${KOVA_DOCS_OUT}/Doxyfile
    COMMAND ${KOVA_JAVADOC} -Xdoclint:all -Werror -quiet -encoding UTF-8
            -d ${KOVA_DOCS_OUT}/html/java ${KOVA_JAVA_SOURCE}
    COMMAND ${PROJECT_SOURCE_DIR}/tools/check_api_docs.sh ${KOVA_DOCS_OUT}/xml/index.xml
            ${PROJECT_SOURCE_DIR}/tools/exports.txt
            ${KOVA_JAVA_SOURCE}
    DEPENDS ${KOVA_DOCS_INPUTS} ${KOVA_JAVA_SOURCE} ${KOVA_DOCS_OUT}/Doxyfile
            ${PROJECT_SOURCE_DIR}/tools/check_api_docs.sh
    WORKING_DIRECTORY ${PROJECT_SOURCE_DIR}
    COMMENT "API reference: Doxygen HTML in ${KOVA_DOCS_OUT}/html"
    VERBATIM)
add_custom_target(kova_docs DEPENDS ${KOVA_DOCS_OUT}/html/index.html)
