# The math library behind src/kernels, as the target morva::math, and the vector layer, morva::vectors.
#   MORVA_MATH=mkl        oneMKL (x86-64 only; the default there on Linux)
#   MORVA_MATH=portable   transforms of DUCC, products and functions over the vector layer
if(CMAKE_SYSTEM_NAME STREQUAL Linux AND CMAKE_SYSTEM_PROCESSOR STREQUAL x86_64)
    set(math_default mkl)
else()
    set(math_default portable)
endif()
set(MORVA_MATH ${math_default} CACHE STRING "Math library: mkl (oneMKL) or portable (DUCC)")
set_property(CACHE MORVA_MATH PROPERTY STRINGS mkl portable)
if(NOT MORVA_MATH MATCHES "^(mkl|portable)$")
    message(FATAL_ERROR "MORVA_MATH is neither mkl nor portable: ${MORVA_MATH}")
endif()

# What engine products hold of others; MORVA_LICENSE_<part> names the text that goes along with it.
set(MORVA_engine_PARTS Highway DUCC oneMKL LLVM MinGW)

# Headers only: what the kernels use of Highway needs no library at run time.
find_path(MORVA_HIGHWAY_INCLUDE hwy/highway.h REQUIRED)
add_library(morva_vectors INTERFACE)
add_library(morva::vectors ALIAS morva_vectors)
target_include_directories(morva_vectors SYSTEM INTERFACE ${MORVA_HIGHWAY_INCLUDE})
find_file(MORVA_LICENSE_Highway copyright PATHS /usr/share/doc/libhwy-dev NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH)

find_package(Threads REQUIRED)
add_library(morva_math INTERFACE)
add_library(morva::math ALIAS morva_math)
target_link_libraries(morva_math INTERFACE Threads::Threads)
if(MORVA_MATH STREQUAL portable)
    # The sources that scripts/setup puts there.
    find_path(MORVA_DUCC_INCLUDE ducc0/fft/fft1d_impl.h PATHS ${PROJECT_SOURCE_DIR}/.deps/ducc/src
              NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH)
    if(NOT MORVA_DUCC_INCLUDE)
        message(FATAL_ERROR "DUCC not found: run ./scripts/setup, or name the folder src of its sources with "
                            "-DMORVA_DUCC_INCLUDE")
    endif()
    find_file(MORVA_LICENSE_DUCC LICENSE.txt PATHS ${MORVA_DUCC_INCLUDE}/.. NO_DEFAULT_PATH NO_CMAKE_FIND_ROOT_PATH)
    return()
endif()

# oneMKL's static sequential layer, looked for in MKLROOT, then in .deps/mkl, where scripts/setup
# unpacks the Python wheels. Sequential is deliberate: products of this size never gain from threads, and
# the audio path stays free of a threading runtime.
find_path(MORVA_MKL_INCLUDE mkl_dfti.h HINTS $ENV{MKLROOT}/include ${PROJECT_SOURCE_DIR}/.deps/mkl/include
          NO_DEFAULT_PATH)
foreach(layer intel_lp64 sequential core)
    find_library(MORVA_MKL_${layer} NAMES libmkl_${layer}.a
                 HINTS $ENV{MKLROOT}/lib $ENV{MKLROOT}/lib/intel64 ${PROJECT_SOURCE_DIR}/.deps/mkl/lib
                 NO_DEFAULT_PATH)
endforeach()
if(NOT MORVA_MKL_INCLUDE OR NOT MORVA_MKL_intel_lp64 OR NOT MORVA_MKL_sequential OR NOT MORVA_MKL_core)
    message(FATAL_ERROR "oneMKL not found: run ./scripts/setup, point MKLROOT at an installation, or "
                        "choose -DMORVA_MATH=portable")
endif()
cmake_path(GET MORVA_MKL_INCLUDE PARENT_PATH mkl_root)
find_file(MORVA_LICENSE_oneMKL NAMES LICENSE.txt licensing/license.txt PATHS ${mkl_root} NO_DEFAULT_PATH)
target_include_directories(morva_math SYSTEM INTERFACE ${MORVA_MKL_INCLUDE})
target_link_libraries(morva_math INTERFACE
    -Wl,--start-group ${MORVA_MKL_intel_lp64} ${MORVA_MKL_sequential} ${MORVA_MKL_core} -Wl,--end-group
    m ${CMAKE_DL_LIBS})
