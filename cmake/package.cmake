# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# The Debian packages: libquillmark1, libquillmark-dev and fptest. scripts/package
# makes them and looks at them. They hold the code that the tests run, compiled with
# the same options.
if(NOT QUILLMARK_BUILD_TOOLS)
  message(FATAL_ERROR "QUILLMARK_PACKAGE makes a package of fptest too: set QUILLMARK_BUILD_TOOLS")
endif()

set(packaging ${PROJECT_SOURCE_DIR}/cmake/package)
set(CPACK_DEBIAN_PACKAGE_RELEASE 1)
set(debian_version ${PROJECT_VERSION}-${CPACK_DEBIAN_PACKAGE_RELEASE})

# cpack builds nothing that is not packaged
set(CMAKE_SKIP_INSTALL_ALL_DEPENDENCY ON)

# the build's directory leaves no trace, not even the length of its name
set_target_properties(quillmark fptest PROPERTIES BUILD_WITH_INSTALL_RPATH ON)

# --- what only packages have --------------------------------------------------

find_program(GZIP_PROGRAM gzip REQUIRED)

# Installs FILE compressed, as NAME.gz.
function(quillmark_install_compressed file directory name component)
  set(compressed ${PROJECT_BINARY_DIR}/package/${component}/${name}.gz)
  file(MAKE_DIRECTORY ${PROJECT_BINARY_DIR}/package/${component})
  set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${file})
  execute_process(COMMAND ${GZIP_PROGRAM} -9n
    INPUT_FILE ${file} OUTPUT_FILE ${compressed} COMMAND_ERROR_IS_FATAL ANY)
  install(FILES ${compressed} DESTINATION ${directory} COMPONENT ${component})
endfunction()

foreach(package runtime:libquillmark1 development:libquillmark-dev fptest:fptest)
  string(REGEX MATCH "(.*):(.*)" package ${package})
  set(component ${CMAKE_MATCH_1})
  set(documents ${CMAKE_INSTALL_DATADIR}/doc/${CMAKE_MATCH_2})
  install(FILES ${packaging}/copyright DESTINATION ${documents} COMPONENT ${component})
  quillmark_install_compressed(
    ${packaging}/changelog ${documents} changelog.Debian ${component})
endforeach()
foreach(page fptest.1 fptest-results.5 quillmark-plan.5)
  string(REGEX MATCH "[0-9]$" section ${page})
  quillmark_install_compressed(
    ${PROJECT_SOURCE_DIR}/docs/${page} ${CMAKE_INSTALL_MANDIR}/man${section} ${page} fptest)
endforeach()

# --- who needs which version of the library -----------------------------------

set(control ${PROJECT_BINARY_DIR}/package/control)
file(WRITE ${control}/shlibs
  "libquillmark ${PROJECT_VERSION_MAJOR} libquillmark1 (>= ${PROJECT_VERSION})\n")
configure_file(${packaging}/symbols ${control}/symbols COPYONLY)
file(WRITE ${control}/triggers "activate-noawait ldconfig\n")

# --- the packages -------------------------------------------------------------

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_ALL runtime development fptest)
set(CPACK_STRIP_FILES ON)
set(CPACK_INSTALL_DEFAULT_DIRECTORY_PERMISSIONS
  OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
set(CPACK_POST_BUILD_SCRIPTS ${packaging}/finish.cmake)

set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_MAINTAINER "Quillmark authors <quillmark@example.org>")
set(CPACK_DEBIAN_PACKAGE_SOURCE quillmark)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${PROJECT_BINARY_DIR})

# lines as they are to be: nobody folds them later
set(about "Quillmark lets a remote test service drive the tests of a fingerprint-sensor
stack: it stores an XML test plan, runs its items through the shell, and
keeps what they report.")

set(CPACK_DEBIAN_RUNTIME_PACKAGE_NAME libquillmark1)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_RUNTIME_PACKAGE_CONTROL_EXTRA
  ${control}/shlibs ${control}/symbols ${control}/triggers)
set(CPACK_DEBIAN_RUNTIME_DESCRIPTION "test library for fingerprint-sensor stacks - library
${about}
.
This package holds the shared library, and the Linux implementation of the
interfaces that a device's platform provides.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libquillmark-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "libquillmark1 (= ${debian_version}), libmxml-dev")
set(CPACK_DEBIAN_DEVELOPMENT_DESCRIPTION "test library for fingerprint-sensor stacks - development
${about}
.
This package holds what agents and test items are built with: the header,
those of the platform's interfaces, and files for CMake and pkg-config.")

set(CPACK_DEBIAN_FPTEST_PACKAGE_NAME fptest)
set(CPACK_DEBIAN_FPTEST_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_FPTEST_PACKAGE_DEPENDS "libquillmark1 (>= ${PROJECT_VERSION})")
set(CPACK_DEBIAN_FPTEST_DESCRIPTION "run test plans of a fingerprint-sensor stack
${about}
.
This package holds fptest, which checks a test plan, runs groups or single
items of it, shows their progress, and writes results as JUnit XML, JSON or
TAP.")

include(CPack)
