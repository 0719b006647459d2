# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# The platform's libraries: Vorlane::Vorlane, and a directory with their headers.
#
# VORLANE_LIBRARIES lists a device's own; without it their Linux implementations
# are built, as the target vorlane. VORLANE_INCLUDE_DIR names the headers that
# come with them.

set(VORLANE_LIBRARIES "" CACHE FILEPATH "The platform's libraries; empty builds those for Linux")
set(VORLANE_INCLUDE_DIR "${PROJECT_SOURCE_DIR}/vorlane" CACHE PATH "The platform's headers")

set(VORLANE_HEADERS mxml_whitespace.h sockwrap.h sysparm.h vr_log.h)
foreach(header ${VORLANE_HEADERS})
  if(NOT EXISTS "${VORLANE_INCLUDE_DIR}/${header}")
    message(FATAL_ERROR "VORLANE_INCLUDE_DIR has no ${header}: ${VORLANE_INCLUDE_DIR}")
  endif()
endforeach()

if(VORLANE_LIBRARIES)
  foreach(library IN LISTS VORLANE_LIBRARIES)
    if(NOT IS_ABSOLUTE "${library}" OR NOT EXISTS "${library}" OR IS_DIRECTORY "${library}")
      message(FATAL_ERROR "VORLANE_LIBRARIES names no file by its whole path: ${library}; "
        "several are separated by ';'")
    endif()
  endforeach()
  if(QUILLMARK_BUILD_TESTS)
    message(FATAL_ERROR "The tests are those of the Linux implementations: "
      "set QUILLMARK_BUILD_TESTS to OFF, or VORLANE_LIBRARIES to nothing")
  endif()
  message(STATUS "The platform's libraries: ${VORLANE_LIBRARIES}")
  add_library(vorlane_given INTERFACE)
  target_include_directories(vorlane_given INTERFACE "${VORLANE_INCLUDE_DIR}")
  target_link_libraries(vorlane_given INTERFACE ${VORLANE_LIBRARIES})
  add_library(Vorlane::Vorlane ALIAS vorlane_given)
  return()
endif()

# A library of its own, so that a device or a test puts its own in its place at
# load time; without a version in its name, because the platform's has none.
add_library(vorlane SHARED
  vorlane/linux/mxml_whitespace.cpp
  vorlane/linux/sockwrap.cpp
  vorlane/linux/sysparm.cpp
  vorlane/linux/vr_log.cpp)
target_include_directories(vorlane PUBLIC "$<BUILD_INTERFACE:${VORLANE_INCLUDE_DIR}>")
target_link_libraries(vorlane PRIVATE MiniXml::MiniXml quillmark_warnings quillmark_no_cxx_runtime)
# a log beyond 2 GB, on 32-bit devices as well
target_compile_definitions(vorlane PRIVATE _FILE_OFFSET_BITS=64)
set_target_properties(vorlane PROPERTIES LINKER_LANGUAGE C UNITY_BUILD OFF)
add_library(Vorlane::Vorlane ALIAS vorlane)
