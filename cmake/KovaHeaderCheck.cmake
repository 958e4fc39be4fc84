# SPDX-License-Identifier: Apache-2.0
# Every header directly in include/kova/ must compile on its own, first in a translation unit,
# as C11 and as C++17, with -Wall -Wextra -Werror and only the public include folder on the path.
# The headers under include/kova/android/ are C++ only and need the platform's headers: each is
# checked alone as C++17 with those on the path.
file(GLOB KOVA_STANDALONE_HEADERS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/include/kova/*.h)
set(KOVA_HEADER_CHECK_DIR ${PROJECT_BINARY_DIR}/header_check)
set(KOVA_HEADER_CHECK_C "")
set(KOVA_HEADER_CHECK_CXX "")
foreach(header ${KOVA_STANDALONE_HEADERS})
    get_filename_component(name ${header} NAME_WE)
    foreach(ext c cpp)
        set(unit ${KOVA_HEADER_CHECK_DIR}/${name}.${ext})
        file(CONFIGURE OUTPUT ${unit} CONTENT "#include <kova/${name}.h>\nint kova_header_check_${name}_${ext};\n")
    endforeach()
    list(APPEND KOVA_HEADER_CHECK_C ${KOVA_HEADER_CHECK_DIR}/${name}.c)
    list(APPEND KOVA_HEADER_CHECK_CXX ${KOVA_HEADER_CHECK_DIR}/${name}.cpp)
endforeach()

file(GLOB KOVA_PLATFORM_HEADERS CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/include/kova/android/*.h)
set(KOVA_HEADER_CHECK_PLATFORM "")
foreach(header ${KOVA_PLATFORM_HEADERS})
    get_filename_component(name ${header} NAME_WE)
    set(unit ${KOVA_HEADER_CHECK_DIR}/android_${name}.cpp)
    file(CONFIGURE OUTPUT ${unit}
         CONTENT "#include <kova/android/${name}.h>\nint kova_header_check_android_${name};\n")
    list(APPEND KOVA_HEADER_CHECK_PLATFORM ${unit})
endforeach()

add_library(kova_header_check_c OBJECT ${KOVA_HEADER_CHECK_C})
set_target_properties(kova_header_check_c PROPERTIES C_STANDARD 11 C_STANDARD_REQUIRED ON
    C_EXTENSIONS OFF)
add_library(kova_header_check_cxx OBJECT ${KOVA_HEADER_CHECK_CXX})
set_target_properties(kova_header_check_cxx PROPERTIES CXX_STANDARD 17 CXX_STANDARD_REQUIRED ON
    CXX_EXTENSIONS OFF)
add_library(kova_header_check_android OBJECT ${KOVA_HEADER_CHECK_PLATFORM})
set_target_properties(kova_header_check_android PROPERTIES CXX_STANDARD 17
    CXX_STANDARD_REQUIRED ON CXX_EXTENSIONS OFF)
target_include_directories(kova_header_check_android PRIVATE ${KOVA_ANDROID_INCLUDE})
foreach(target kova_header_check_c kova_header_check_cxx kova_header_check_android)
    target_include_directories(${target} PRIVATE ${PROJECT_SOURCE_DIR}/include)
    target_compile_options(${target} PRIVATE -Wall -Wextra -Werror)
endforeach()
