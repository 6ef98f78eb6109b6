# What a Debian package has beside an installation: run by CPack on the staged files.
if(NOT CPACK_GENERATOR STREQUAL DEB)
    return()
endif()
set(usr ${CPACK_TEMPORARY_DIRECTORY}/usr)
set(doc ${usr}/share/doc/morva)

# ---- copyright, changelog, manual page -----------------------------------------------------------
if(EXISTS ${doc}/LICENSE.oneMKL.txt)
    message(FATAL_ERROR "Six libraries of 22 MB: package a build with MORVA_MATH=portable (scripts/package deb)")
endif()
file(WRITE ${doc}/copyright "Format: https://www.debian.org/doc/packaging-manuals/copyright-format/1.0/
Upstream-Name: morva

Files: *
Copyright: the Morva project
License: Apache-2.0
 On Debian systems the text of this licence is in /usr/share/common-licenses/Apache-2.0.
Comment:
 The models in /usr/share/morva/models were trained on the recordings that ATTRIBUTIONS.md there names.
 The libraries contain parts of Highway under the same licence: Copyright 2019-2022 Google LLC.
 They also contain the Fourier transforms of DUCC, BSD-3-Clause: Copyright 2010-2026 Max-Planck-Society, 2019 Peter
 Bell. The text of this licence is in /usr/share/doc/morva/LICENSE.DUCC.txt.
")
file(REMOVE ${doc}/LICENSE)

string(TIMESTAMP date "%a, %d %b %Y %H:%M:%S +0000" UTC)
file(WRITE ${doc}/changelog "morva (${CPACK_PACKAGE_VERSION}) unstable; urgency=medium

  * What has changed is told in CHANGELOG.md.

 -- ${CPACK_PACKAGE_CONTACT}  ${date}
")
execute_process(COMMAND gzip -9n ${doc}/changelog ${usr}/share/man/man1/morva.1 COMMAND_ERROR_IS_FATAL ANY)

file(WRITE ${usr}/share/lintian/overrides/morva
"# One package on purpose: command line, library, headers and plugins of one engine and its models.
morva: package-name-doesnt-match-sonames
morva: link-to-shared-library-in-wrong-package
# There is no other architecture to build for.
morva: pkg-config-unavailable-for-cross-compilation
")

# ---- control files -------------------------------------------------------------------------------
# CPack would write scripts that call ldconfig for every library in lib/*, so the library's dependencies
# are found here.
set(control ${CPACK_TOPLEVEL_DIRECTORY}/control)
file(WRITE ${control}/triggers "activate-noawait ldconfig\n")
string(REGEX MATCH "^[0-9]+" major ${CPACK_PACKAGE_VERSION})
file(WRITE ${control}/shlibs "libmorva ${major} morva (>= ${CPACK_PACKAGE_VERSION})\n")
file(WRITE ${control}/debian/control "Source: morva\n\nPackage: morva\nArchitecture: any\n")
file(GLOB_RECURSE binaries LIST_DIRECTORIES false ${usr}/bin/* ${usr}/lib/*.so)
execute_process(COMMAND dpkg-shlibdeps -O --ignore-missing-info -l${usr}/lib -xmorva ${binaries}
    WORKING_DIRECTORY ${control} OUTPUT_VARIABLE depends ERROR_QUIET COMMAND_ERROR_IS_FATAL ANY)
string(REGEX MATCH "shlibs:Depends=([^\n]*)" depends "${depends}")
set(CPACK_DEBIAN_PACKAGE_DEPENDS ${CMAKE_MATCH_1})
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${control}/triggers ${control}/shlibs)
