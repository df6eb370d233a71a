# SPDX-License-Identifier: MIT
#
# Compiler flags: what every target is compiled with, and what the shipped code adds.

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_C_STANDARD 11)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)
set(CMAKE_CXX_FLAGS_RELEASE "-O2 -DNDEBUG")
set(CMAKE_C_FLAGS_RELEASE "-O2 -DNDEBUG")
set(CMAKE_POSITION_INDEPENDENT_CODE ON)

if(NOT CMAKE_BUILD_TYPE)
    set(CMAKE_BUILD_TYPE Release CACHE STRING "" FORCE)
endif()

# Everybody: tests and platform pieces as well as the tool.
add_library(project_warnings INTERFACE)
target_compile_options(project_warnings INTERFACE
    -Wall -Wextra -Wpedantic -Wconversion -Wshadow -Wformat=2 -Werror)
target_compile_definitions(project_warnings INTERFACE
    _GNU_SOURCE _FILE_OFFSET_BITS=64 _TIME_BITS=64)

# The same source gives the same bytes, whatever folder it is built in.
target_compile_options(project_warnings INTERFACE
    "-ffile-prefix-map=${CMAKE_SOURCE_DIR}=." "-ffile-prefix-map=${CMAKE_BINARY_DIR}=build")

# The tool and its libraries need nothing of the C++ runtime library: start-up costs what a C
# program's start-up costs.
add_library(project_product INTERFACE)
target_link_libraries(project_product INTERFACE project_warnings)
target_compile_options(project_product INTERFACE
    $<$<COMPILE_LANGUAGE:CXX>:-fno-exceptions;-fno-rtti;-fno-threadsafe-statics>
    -fvisibility=hidden -fstack-protector-strong
    # A stack that grows touches every page on its way.
    -fstack-clash-protection)
# Indirect jumps land where they may, on processors that look after that.
if(CMAKE_SYSTEM_PROCESSOR STREQUAL "x86_64" AND CMAKE_SIZEOF_VOID_P EQUAL 8)
    target_compile_options(project_product INTERFACE -fcf-protection)
endif()
target_compile_options(project_product INTERFACE
    $<$<CONFIG:Release>:-U_FORTIFY_SOURCE;-D_FORTIFY_SOURCE=3;-ffunction-sections;-fdata-sections>
    # Nothing unwinds: there are no exceptions, and a debugger has its own tables.
    $<$<CONFIG:Release>:-fno-unwind-tables;-fno-asynchronous-unwind-tables>)

# A library of the product: NAME, the layers below it, and its sources. Other programs may link it, too:
# it is installed with its headers, for pkg-config and for CMake, when the component dev is asked for.
function(add_layer szName)
    cmake_parse_arguments(PARSE_ARGV 1 LAYER "" "" "SOURCES;USES")
    string(REGEX REPLACE "^lib" "" szShort ${szName})
    add_library(${szName} STATIC ${LAYER_SOURCES})
    set_target_properties(${szName} PROPERTIES
        OUTPUT_NAME ${szName} PREFIX "" EXPORT_NAME ${szShort})
    target_include_directories(${szName} PUBLIC
        $<BUILD_INTERFACE:${CMAKE_CURRENT_SOURCE_DIR}/include>
        $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}/arrayctl> PRIVATE lib)
    target_compile_features(${szName} INTERFACE cxx_std_20)
    target_link_libraries(${szName}
        PUBLIC ${LAYER_USES} PRIVATE $<BUILD_INTERFACE:project_product>)

    install(TARGETS ${szName} EXPORT arrayctl-libraries
        ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT dev EXCLUDE_FROM_ALL)
    install(DIRECTORY include/ DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/arrayctl
        COMPONENT dev EXCLUDE_FROM_ALL)
    # From the file's own place, so that it is right below any prefix.
    file(RELATIVE_PATH szToPrefix "/${CMAKE_INSTALL_LIBDIR}/pkgconfig" "/")
    list(TRANSFORM LAYER_USES REPLACE "^lib" "" OUTPUT_VARIABLE uses)
    list(JOIN uses ", " szUses)
    configure_file("${PROJECT_SOURCE_DIR}/cmake/library.pc.in"
        "${PROJECT_BINARY_DIR}/${szShort}.pc" @ONLY)
    install(FILES "${PROJECT_BINARY_DIR}/${szShort}.pc"
        DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT dev EXCLUDE_FROM_ALL)
endfunction()
