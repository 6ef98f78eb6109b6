# Finds oneMKL's static sequential layer and offers it as the target morva::mkl.
# Looked for in MKLROOT, then in .deps/mkl, where scripts/setup unpacks the Python wheels.
# The sequential layer is deliberate: products of this size never gain from threads, and the audio
# path stays free of a threading runtime.
find_path(MORVA_MKL_INCLUDE mkl_dfti.h HINTS $ENV{MKLROOT}/include ${PROJECT_SOURCE_DIR}/.deps/mkl/include
          NO_DEFAULT_PATH)
foreach(layer intel_lp64 sequential core)
    find_library(MORVA_MKL_${layer} NAMES libmkl_${layer}.a
                 HINTS $ENV{MKLROOT}/lib $ENV{MKLROOT}/lib/intel64 ${PROJECT_SOURCE_DIR}/.deps/mkl/lib
                 NO_DEFAULT_PATH)
endforeach()
if(NOT MORVA_MKL_INCLUDE OR NOT MORVA_MKL_intel_lp64 OR NOT MORVA_MKL_sequential OR NOT MORVA_MKL_core)
    message(FATAL_ERROR "oneMKL not found: run ./scripts/setup, or point MKLROOT at an installation")
endif()
find_package(Threads REQUIRED)
add_library(morva_mkl INTERFACE)
add_library(morva::mkl ALIAS morva_mkl)
target_include_directories(morva_mkl SYSTEM INTERFACE ${MORVA_MKL_INCLUDE})
target_link_libraries(morva_mkl INTERFACE
    -Wl,--start-group ${MORVA_MKL_intel_lp64} ${MORVA_MKL_sequential} ${MORVA_MKL_core} -Wl,--end-group
    Threads::Threads m ${CMAKE_DL_LIBS})
