# Emscripten, from Debian: WebAssembly with its vector and exception instructions. Programs run in the script
# runtime, whose own fetch this Emscripten takes for a browser's.
set(CMAKE_CROSSCOMPILING_EMULATOR node;--no-experimental-fetch)
set(CMAKE_C_FLAGS_INIT "-msimd128")
set(CMAKE_CXX_FLAGS_INIT "-msimd128 -fwasm-exceptions")
set(CMAKE_EXE_LINKER_FLAGS_INIT "-fwasm-exceptions -sALLOW_MEMORY_GROWTH=1")
# Debian's place of what the linker's scripts import, which other builds of the runtime do not know.
set(ENV{NODE_PATH} /usr/share/nodejs)
set(CMAKE_C_LINKER_LAUNCHER env;NODE_PATH=/usr/share/nodejs)
set(CMAKE_CXX_LINKER_LAUNCHER env;NODE_PATH=/usr/share/nodejs)
include(/usr/share/emscripten/cmake/Modules/Platform/Emscripten.cmake)
# Headers that are the same for all processors, without those beside them, which are not.
file(MAKE_DIRECTORY ${CMAKE_BINARY_DIR}/vectors)
file(CREATE_LINK /usr/include/hwy ${CMAKE_BINARY_DIR}/vectors/hwy SYMBOLIC)
set(MORVA_HIGHWAY_INCLUDE ${CMAKE_BINARY_DIR}/vectors)
