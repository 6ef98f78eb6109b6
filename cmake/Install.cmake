# What `cmake --install` puts where, the CMake package, the pkg-config file and the Debian package. The component
# `engine` is what a host takes into a package of its own: library, models, licences.
include(CMakePackageConfigHelpers)

set(MORVA_INSTALL_MODELS ${CMAKE_INSTALL_DATADIR}/morva/models)
set(package_dir ${CMAKE_INSTALL_LIBDIR}/cmake/morva)

install(TARGETS morva EXPORT morvaTargets
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT engine
        RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT engine
        ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT engine)
install(FILES src/morva-sdk/morva-sdk.h src/morva-sdk/morva-ext.h
        DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/morva)
install(DIRECTORY models/ DESTINATION ${MORVA_INSTALL_MODELS} COMPONENT engine
        FILES_MATCHING PATTERN "*.mvw" PATTERN "*.md" PATTERN "*.json")

install(EXPORT morvaTargets NAMESPACE morva:: DESTINATION ${package_dir})
configure_package_config_file(cmake/morvaConfig.cmake.in ${PROJECT_BINARY_DIR}/morvaConfig.cmake
    INSTALL_DESTINATION ${package_dir} PATH_VARS MORVA_INSTALL_MODELS)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/morvaConfigVersion.cmake
    COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/morvaConfig.cmake ${PROJECT_BINARY_DIR}/morvaConfigVersion.cmake
        DESTINATION ${package_dir})

# Relative to the .pc file, so that an installation can be moved.
file(RELATIVE_PATH MORVA_PC_PREFIX /x/${CMAKE_INSTALL_LIBDIR}/pkgconfig /x)
configure_file(cmake/morva.pc.in ${PROJECT_BINARY_DIR}/morva.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/morva.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

install(FILES packaging/morva.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)
install(FILES packaging/morva.bash RENAME morva
        DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions)
install(FILES CHANGELOG.md DESTINATION ${CMAKE_INSTALL_DOCDIR})
install(FILES LICENSE DESTINATION ${CMAKE_INSTALL_DOCDIR} COMPONENT engine)
# What is compiled or linked in comes with its licence.
foreach(component engine command)
    foreach(part ${MORVA_${component}_PARTS})
        if(MORVA_LICENSE_${part})
            install(FILES ${MORVA_LICENSE_${part}} RENAME LICENSE.${part}.txt DESTINATION ${CMAKE_INSTALL_DOCDIR}
                    COMPONENT ${component})
        endif()
    endforeach()
endforeach()

set(CPACK_PACKAGE_NAME morva)
set(CPACK_PACKAGE_VENDOR "the Morva project")
set(CPACK_PACKAGE_CONTACT "the Morva project <maintainers@morva.invalid>")
set(CPACK_PACKAGE_VERSION ${PROJECT_VERSION})
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY ${PROJECT_DESCRIPTION})
set(CPACK_PACKAGE_DESCRIPTION
"Takes the noise out of live voices and recordings with trained models, and
scores voice and noise while it does. Contains the command line, the library
with its headers, plugins for LADSPA, LV2 and GStreamer hosts, and the models.")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_STRIP_FILES ON)
set(CPACK_GENERATOR DEB)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION sound)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_PRE_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/packaging/debian.cmake)
include(CPack)
