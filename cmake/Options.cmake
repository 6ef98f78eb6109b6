# Compiler settings shared by every target of this project: the target morva_options.
# Everything is compiled for the baseline of its processor family; src/kernels asks for more itself.
option(MORVA_FUZZ "Build the fuzzers (clang)" OFF)
set(MORVA_SANITIZE "" CACHE STRING "Sanitizers, as for -fsanitize=")

if(CMAKE_CXX_FLAGS MATCHES "fast-math" OR CMAKE_C_FLAGS MATCHES "fast-math")
    message(FATAL_ERROR "-ffast-math breaks the NaN handling that the engine promises")
endif()

set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_C_STANDARD 11)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_C_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
set(origin $ORIGIN)  # a program's own folder, where it looks for libraries
if(APPLE)
    set(origin @loader_path)
    foreach(kind SHARED_LIBRARY_RUNTIME_C SHARED_LIBRARY_RUNTIME_CXX EXECUTABLE_RUNTIME_CXX)
        set(CMAKE_${kind}_FLAG -Wl,-rpath,)  # CMake knows this where it runs on the system itself
    endforeach()
endif()

add_library(morva_options INTERFACE)
target_compile_options(morva_options INTERFACE
    -Wall -Wextra -Wpedantic -Werror -Wshadow -Wconversion -Wno-sign-conversion
    $<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor -Wold-style-cast> -ffunction-sections -fdata-sections
    $<$<CXX_COMPILER_ID:GNU>:-Wno-restrict>  # false alarms on std::string in GCC 12
    -fno-math-errno -ffp-contract=off)
target_link_options(morva_options INTERFACE
    $<IF:$<PLATFORM_ID:Darwin>,-Wl$<COMMA>-dead_strip,-Wl$<COMMA>--gc-sections>)
if(MORVA_SANITIZE)
    target_compile_options(morva_options INTERFACE -fsanitize=${MORVA_SANITIZE} -fno-omit-frame-pointer
                           -fno-sanitize-recover=all -O1
                           $<$<CXX_COMPILER_ID:GNU>:-Wno-maybe-uninitialized>)  # false alarms on std::regex in GCC 12
    target_link_options(morva_options INTERFACE -fsanitize=${MORVA_SANITIZE})
endif()
if(MORVA_FUZZ)
    target_compile_options(morva_options INTERFACE -fsanitize=fuzzer-no-link)
endif()

# A shared library or module exports what the map names, whatever static libraries it holds. Other systems than Linux
# export what is declared visible; on Windows nothing is declared, and the names are listed: those of the map, where it
# has a pattern the functions of that name in the headers.
function(morva_export target map)
    if(CMAKE_SYSTEM_NAME STREQUAL Linux)
        target_link_options(${target} PRIVATE -Wl,--version-script=${map})
        set_target_properties(${target} PROPERTIES LINK_DEPENDS ${map})
    elseif(APPLE)
        set(operators ${PROJECT_SOURCE_DIR}/src/utils/allocation_darwin.cpp)
        target_sources(${target} PRIVATE ${operators})
        set_source_files_properties(${operators} TARGET_DIRECTORY ${target} PROPERTIES
            COMPILE_OPTIONS -fvisibility-global-new-delete=force-hidden)
    elseif(WIN32)
        file(READ ${map} patterns)
        string(REPLACE ";" "," patterns "${patterns}")
        string(REGEX MATCHALL "[A-Za-z0-9_]+[*]?," patterns "${patterns}")
        set(declared "")
        foreach(header ${ARGN})
            file(READ ${header} text)
            string(APPEND declared "${text}")
        endforeach()
        set(names "")
        foreach(pattern ${patterns})
            string(REGEX MATCH "[A-Za-z0-9_]+" start ${pattern})
            if(pattern MATCHES "[*]")
                string(REGEX MATCHALL "${start}[A-Za-z0-9_]+\\(" start "${declared}")
            endif()
            list(APPEND names ${start})
        endforeach()
        list(REMOVE_DUPLICATES names)
        list(TRANSFORM names REPLACE "\\(" "")
        list(JOIN names "\n" names)
        file(CONFIGURE OUTPUT ${target}.def CONTENT "EXPORTS\n${names}\n")
        target_sources(${target} PRIVATE ${CMAKE_CURRENT_BINARY_DIR}/${target}.def)
    endif()
endfunction()
