# SPDX-License-Identifier: Apache-2.0
# Builds for the processor of KEST_TRIPLE (arm-linux-gnueabihf) with Debian's cross compiler,
# or with clang and the cross compiler's libraries (KEST_CLANG). With KEST_LAUNCHER, a program
# of tests/targets/launch.cpp, every program NAME that is linked is NAME.elf, and NAME the
# launcher. scripts/test-arm uses this.
set(CMAKE_TRY_COMPILE_PLATFORM_VARIABLES KEST_TRIPLE KEST_CLANG)
set(CMAKE_SYSTEM_NAME Linux)
string(REGEX REPLACE "-.*" "" CMAKE_SYSTEM_PROCESSOR ${KEST_TRIPLE})
if(KEST_CLANG)
    set(CMAKE_C_COMPILER clang)
    set(CMAKE_CXX_COMPILER clang++)
    set(CMAKE_C_FLAGS_INIT --target=${KEST_TRIPLE})
    set(CMAKE_CXX_FLAGS_INIT --target=${KEST_TRIPLE})
else()
    set(CMAKE_C_COMPILER ${KEST_TRIPLE}-gcc)
    set(CMAKE_CXX_COMPILER ${KEST_TRIPLE}-g++)
endif()
set(CMAKE_FIND_ROOT_PATH /usr/${KEST_TRIPLE})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

get_property(trying GLOBAL PROPERTY IN_TRY_COMPILE)
if(KEST_LAUNCHER AND NOT trying)
    set(CMAKE_CXX_LINK_EXECUTABLE
        "<CMAKE_CXX_COMPILER> <FLAGS> <CMAKE_CXX_LINK_FLAGS> <LINK_FLAGS> <OBJECTS> -o <TARGET>.elf <LINK_LIBRARIES>"
        "${CMAKE_COMMAND} -E copy ${KEST_LAUNCHER} <TARGET>")
endif()
