# Puts the resampling library and its licence text beside the module, if the module needs it.
#   cmake -DMODULE=<file> -DRESAMPLE_LIBRARY=<file> -P stage_runtime.cmake
find_program(READELF readelf REQUIRED)
execute_process(COMMAND ${READELF} -d ${MODULE} OUTPUT_VARIABLE dynamic COMMAND_ERROR_IS_FATAL ANY)
get_filename_component(folder ${MODULE} DIRECTORY)
if(NOT dynamic MATCHES "\\[(libresample\\.so[^]]*)\\]")
    file(GLOB stale ${folder}/libresample.so* ${folder}/LICENSE.libresample)
    if(stale)
        file(REMOVE ${stale})
    endif()
    return()
endif()
set(soname ${CMAKE_MATCH_1})
file(REAL_PATH ${RESAMPLE_LIBRARY} library)
execute_process(COMMAND ${CMAKE_COMMAND} -E copy_if_different ${library} ${folder}/${soname}
                COMMAND_ERROR_IS_FATAL ANY)
foreach(licence /usr/share/doc/libresample1/copyright /usr/share/doc/libresample1-dev/copyright)
    if(EXISTS ${licence})
        execute_process(COMMAND ${CMAKE_COMMAND} -E copy_if_different ${licence}
                        ${folder}/LICENSE.libresample COMMAND_ERROR_IS_FATAL ANY)
        break()
    endif()
endforeach()
