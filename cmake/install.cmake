# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# What cmake --install puts where. The installed tree can be moved as a whole; with
# QUILLMARK_PACKAGE it is the machine's own, and cpack makes Debian packages of it.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

option(QUILLMARK_PACKAGE "Install as Debian packages do: see scripts/package" OFF)

# --- the libraries ------------------------------------------------------------

install(TARGETS quillmark EXPORT quillmark
  LIBRARY
    DESTINATION ${CMAKE_INSTALL_LIBDIR}
    COMPONENT runtime
    NAMELINK_COMPONENT development)

if(TARGET vorlane)
  # Not beside the library, so that it hides no other: the platform's has the same
  # name.
  set(vorlane_directory ${CMAKE_INSTALL_LIBDIR}/quillmark)
  if(ANDROID)
    set(vorlane_directory ${CMAKE_INSTALL_LIBDIR})
  else()
    set_target_properties(quillmark PROPERTIES INSTALL_RPATH $ORIGIN/quillmark)
    # RUNPATH, which LD_LIBRARY_PATH goes before; RPATH would go before that
    target_link_options(quillmark PRIVATE LINKER:--enable-new-dtags)
  endif()
  install(TARGETS vorlane EXPORT quillmark
    LIBRARY DESTINATION ${vorlane_directory} COMPONENT runtime)
endif()

if(TARGET quillmark_ps)
  install(TARGETS quillmark_ps
    RUNTIME DESTINATION ${CMAKE_INSTALL_LIBEXECDIR}/quillmark/bin COMPONENT fptest)
endif()

# --- for those who build on it ------------------------------------------------

target_include_directories(quillmark INTERFACE $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
install(FILES ${PROJECT_SOURCE_DIR}/src/quillmark.h
  DESTINATION ${CMAKE_INSTALL_INCLUDEDIR} COMPONENT development)
foreach(header ${VORLANE_HEADERS})
  install(FILES ${VORLANE_INCLUDE_DIR}/${header}
    DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/vorlane COMPONENT development)
endforeach()

set(cmake_directory ${CMAKE_INSTALL_LIBDIR}/cmake/quillmark)
set(generated ${PROJECT_BINARY_DIR}/install)
write_basic_package_version_file(${generated}/quillmarkConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(EXPORT quillmark
  FILE quillmarkTargets.cmake NAMESPACE quillmark::
  DESTINATION ${cmake_directory} COMPONENT development)
install(
  FILES
    ${PROJECT_SOURCE_DIR}/cmake/MiniXml.cmake
    ${PROJECT_SOURCE_DIR}/cmake/quillmarkConfig.cmake
    ${generated}/quillmarkConfigVersion.cmake
  DESTINATION ${cmake_directory} COMPONENT development)

set(pc_libdir ${CMAKE_INSTALL_FULL_LIBDIR})
set(pc_includedir ${CMAKE_INSTALL_FULL_INCLUDEDIR})
set(pc_prefix ${CMAKE_INSTALL_PREFIX})
if(NOT IS_ABSOLUTE "${CMAKE_INSTALL_LIBDIR}")
  set(pc_libdir "\${prefix}/${CMAKE_INSTALL_LIBDIR}")
  if(NOT QUILLMARK_PACKAGE)
    file(RELATIVE_PATH up /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
    string(REGEX REPLACE "/$" "" up "${up}")
    set(pc_prefix "\${pcfiledir}/${up}")
  endif()
endif()
if(NOT IS_ABSOLUTE "${CMAKE_INSTALL_INCLUDEDIR}")
  set(pc_includedir "\${prefix}/${CMAKE_INSTALL_INCLUDEDIR}")
endif()
# Mini-XML's own description goes with a Mini-XML that compilers find by themselves;
# another one may have none, and a place of its own on each machine
set(pc_mxml "Requires.private: mxml >= 2.7, mxml < 4")
if(NOT MINIXML_INCLUDE_DIR IN_LIST CMAKE_CXX_IMPLICIT_INCLUDE_DIRECTORIES)
  get_filename_component(pc_mxml "${MINIXML_LIBRARY}" NAME)
  string(REGEX REPLACE "^lib(.*)\\.(a|so)(\\.[0-9.]+)?$" "\\1" pc_mxml "${pc_mxml}")
  set(pc_mxml "Libs.private: -l${pc_mxml}")
endif()
configure_file(cmake/quillmark.pc.in ${generated}/quillmark.pc @ONLY)
install(FILES ${generated}/quillmark.pc
  DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig COMPONENT development)

# --- fptest -------------------------------------------------------------------

if(QUILLMARK_BUILD_TOOLS)
  if(NOT QUILLMARK_PACKAGE)
    file(RELATIVE_PATH libraries ${CMAKE_INSTALL_FULL_BINDIR} ${CMAKE_INSTALL_FULL_LIBDIR})
    set_target_properties(fptest PROPERTIES INSTALL_RPATH $ORIGIN/${libraries})
  endif()
  install(TARGETS fptest RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT fptest)
  install(FILES ${PROJECT_SOURCE_DIR}/agent/completion/fptest
    DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions COMPONENT fptest)
endif()

# --- documentation ------------------------------------------------------------

if(QUILLMARK_PACKAGE)
  include(cmake/package.cmake)
else()
  if(QUILLMARK_BUILD_TOOLS)
    install(FILES ${PROJECT_SOURCE_DIR}/docs/fptest.1
      DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT fptest)
    install(FILES ${PROJECT_SOURCE_DIR}/docs/fptest-results.5
      DESTINATION ${CMAKE_INSTALL_MANDIR}/man5 COMPONENT fptest)
  endif()
  install(FILES ${PROJECT_SOURCE_DIR}/docs/quillmark-plan.5
    DESTINATION ${CMAKE_INSTALL_MANDIR}/man5 COMPONENT fptest)
  install(FILES ${PROJECT_SOURCE_DIR}/LICENSES/Apache-2.0.txt
    DESTINATION ${CMAKE_INSTALL_DOCDIR} RENAME LICENSE COMPONENT licence)
endif()
