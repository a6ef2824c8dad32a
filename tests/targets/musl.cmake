# SPDX-License-Identifier: Apache-2.0
# Builds a program with musl, of Debian's package musl-tools, in place of the GNU C library.
# There is no libstdc++ for musl: it takes the compiler's own with what tests/targets/musl.*
# add, and links all of it statically. scripts/test-arm uses this.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_CXX_COMPILER g++)
set(CMAKE_TRY_COMPILE_TARGET_TYPE STATIC_LIBRARY)

function(kest_ask variable)
    execute_process(COMMAND ${CMAKE_CXX_COMPILER} ${ARGN}
        OUTPUT_VARIABLE answer OUTPUT_STRIP_TRAILING_WHITESPACE)
    set(${variable} ${answer} PARENT_SCOPE)
endfunction()
kest_ask(version -dumpversion)
kest_ask(multiarch -print-multiarch)
foreach(file include crtbeginT.o crtend.o libstdc++.a libgcc.a libgcc_eh.a)
    kest_ask(${file} -print-file-name=${file})
endforeach()
string(REPLACE gnu musl musl ${multiarch})

set(CMAKE_CXX_FLAGS_INIT "-include ${CMAKE_CURRENT_LIST_DIR}/musl.h -nostdinc -fno-pie \
-isystem /usr/include/c++/${version} -isystem /usr/include/${multiarch}/c++/${version} \
-isystem /usr/include/${musl} -isystem ${include}")
set(CMAKE_CXX_LINK_EXECUTABLE "<CMAKE_CXX_COMPILER> <FLAGS> -static -no-pie -nostdlib \
-L/usr/lib/${musl} /usr/lib/${musl}/crt1.o /usr/lib/${musl}/crti.o ${crtbeginT.o} \
<OBJECTS> ${CMAKE_CURRENT_LIST_DIR}/musl.cpp <LINK_LIBRARIES> ${libstdc++.a} \
-Wl,--start-group -lc ${libgcc.a} ${libgcc_eh.a} -Wl,--end-group \
${crtend.o} /usr/lib/${musl}/crtn.o -o <TARGET>")
