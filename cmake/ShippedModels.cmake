# The one list of shipped models, models/shipped.json, for C++: the header shipped_models.h, found through
# the target morva_shipped_models. For CMake: MORVA_NC_FILES, MORVA_VAD_FILES, MORVA_NoiseDB_FILES.
# Fields of a row, which follows the order of registration:
#   file            weight file in models/
#   name            what a host registers it as
#   kind            NC, VAD or NoiseDB, as in the names of the C interface
#   rate            the model's own sampling rate in hertz
#   maxSampleRate   highest caller's rate in hertz for which it is the first choice among its kind
set(list ${PROJECT_SOURCE_DIR}/models/shipped.json)
set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${list})
file(READ ${list} json)
string(JSON count LENGTH "${json}")
math(EXPR last "${count} - 1")
set(MORVA_SHIPPED_ROWS "")
foreach(kind NC VAD NoiseDB)
    set(MORVA_${kind}_FILES "")
endforeach()
foreach(index RANGE ${last})
    foreach(field file name kind rate maxSampleRate)
        string(JSON ${field} GET "${json}" ${index} ${field})
    endforeach()
    list(APPEND MORVA_${kind}_FILES ${file})
    string(APPEND MORVA_SHIPPED_ROWS
           "    ShippedModel{\"${file}\", \"${name}\", ShippedKind::${kind}, ${rate}, ${maxSampleRate}},\n")
endforeach()
configure_file(cmake/shipped_models.h.in generated/shipped_models.h @ONLY)
add_library(morva_shipped_models INTERFACE)
target_include_directories(morva_shipped_models INTERFACE ${PROJECT_BINARY_DIR}/generated)
