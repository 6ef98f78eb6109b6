# The tool chain of every target of scripts/build: Zig's C and C++ compiler with its own C++ library, which is linked
# in, and the C libraries of all targets. MORVA_TARGET names the target.
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES MORVA_TARGET)

#                     system   processor  the compiler's name for both, with the oldest C library or system
set(target_linux-x64    Linux   x86_64  x86_64-linux-gnu.2.28)
set(target_linux-arm64  Linux   aarch64 aarch64-linux-gnu.2.28)
set(target_win32-x64    Windows x86_64  x86_64-windows-gnu)
set(target_darwin-x64   Darwin  x86_64  x86_64-macos.11.0)
set(target_darwin-arm64 Darwin  arm64   aarch64-macos.11.0)
if(NOT DEFINED target_${MORVA_TARGET})
    message(FATAL_ERROR "No such target: ${MORVA_TARGET}")
endif()
list(POP_FRONT target_${MORVA_TARGET} CMAKE_SYSTEM_NAME CMAKE_SYSTEM_PROCESSOR triple)

# Where scripts/build puts the compiler, headers for all targets, and this target's libraries.
file(REAL_PATH ${CMAKE_CURRENT_LIST_DIR}/../.deps deps)
set(zig ${deps}/zig/ziglang/zig)
set(CMAKE_FIND_ROOT_PATH ${deps}/cross/${MORVA_TARGET} ${deps}/cross/headers)
foreach(kind LIBRARY INCLUDE PACKAGE)
    set(CMAKE_FIND_ROOT_PATH_MODE_${kind} ONLY)
endforeach()
set(ENV{PKG_CONFIG_LIBDIR} ${deps}/cross/${MORVA_TARGET}/lib/pkgconfig)
set(PKG_CONFIG_ARGN --static)

# What is linked in that is not so elsewhere.
set(MORVA_LICENSE_LLVM ${deps}/zig/ziglang/lib/libcxx/LICENSE.TXT)
set(MORVA_LICENSE_CLI11 /usr/share/doc/libcli11-dev/copyright)
set(MORVA_LICENSE_JSON /usr/share/doc/nlohmann-json3-dev/copyright)
set(MORVA_LICENSE_libsndfile ${deps}/cross/sources/libsndfile/COPYING)
set(MORVA_LICENSE_libsamplerate ${deps}/cross/sources/libsamplerate/COPYING)
set(MORVA_command_PARTS CLI11 JSON libsndfile libsamplerate)
if(CMAKE_SYSTEM_NAME STREQUAL Windows)
    set(MORVA_LICENSE_MinGW ${deps}/zig/ziglang/lib/libc/mingw/COPYING)
endif()

# CMake wants each tool as one file; ccache judges them by their names.
set(tools ${deps}/cross/${MORVA_TARGET}/tools)
foreach(tool IN ITEMS "clang=cc -target ${triple}" "clang++=c++ -target ${triple}" ar=ar ranlib=ranlib rc=rc)
    string(REGEX MATCH "^([^=]+)=(.*)$" _ ${tool})
    file(CONFIGURE OUTPUT ${tools}/${CMAKE_MATCH_1} CONTENT
         "#!/bin/sh\nexport ZIG_GLOBAL_CACHE_DIR=${deps}/zig/cache\nexec ${zig} ${CMAKE_MATCH_2} \"$@\"\n")
    file(CHMOD ${tools}/${CMAKE_MATCH_1} PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE
         GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
endforeach()
set(CMAKE_C_COMPILER ${tools}/clang)
set(CMAKE_CXX_COMPILER ${tools}/clang++)
set(CMAKE_RC_COMPILER ${tools}/rc)
set(CMAKE_AR ${tools}/ar CACHE FILEPATH "")
set(CMAKE_RANLIB ${tools}/ranlib CACHE FILEPATH "")
if(CMAKE_SYSTEM_NAME STREQUAL Darwin)
    set(CMAKE_BUILD_WITH_INSTALL_RPATH ON)  # a change at the install would break the signature
endif()
foreach(kind EXE SHARED MODULE)
    set(CMAKE_${kind}_LINKER_FLAGS_INIT -s)  # products are stripped
endforeach()
