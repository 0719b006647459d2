# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# Mini-XML with the interface of its versions 2.7 to 3.x: MiniXml::MiniXml.
# Installed with the library, for find_package(quillmark).
#
# MINIXML_INCLUDE_DIR and MINIXML_LIBRARY name a device's own.

if(TARGET MiniXml::MiniXml)
  return()
endif()
find_path(MINIXML_INCLUDE_DIR mxml.h)
find_library(MINIXML_LIBRARY mxml)

# Sets ${complaint} to what is wrong with what was found, or to nothing.
function(quillmark_check_mini_xml complaint)
  set(advice "set MINIXML_INCLUDE_DIR and MINIXML_LIBRARY")
  if(NOT CMAKE_CROSSCOMPILING)
    set(advice "install libmxml-dev, or ${advice}")
  endif()
  if(NOT MINIXML_INCLUDE_DIR OR NOT MINIXML_LIBRARY)
    set(${complaint} "Mini-XML is missing: ${advice}" PARENT_SCOPE)
    return()
  endif()
  if(NOT EXISTS "${MINIXML_INCLUDE_DIR}/mxml.h")
    set(${complaint} "MINIXML_INCLUDE_DIR has no mxml.h: ${MINIXML_INCLUDE_DIR}" PARENT_SCOPE)
    return()
  endif()
  if(NOT EXISTS "${MINIXML_LIBRARY}" OR IS_DIRECTORY "${MINIXML_LIBRARY}")
    set(${complaint} "MINIXML_LIBRARY names no file: ${MINIXML_LIBRARY}" PARENT_SCOPE)
    return()
  endif()

  file(STRINGS "${MINIXML_INCLUDE_DIR}/mxml.h" lines
    REGEX "^#[ \t]*define[ \t]+MXML_(MAJOR|MINOR)_VERSION[ \t]+[0-9]+")
  foreach(part MAJOR MINOR)
    string(REGEX MATCH "MXML_${part}_VERSION[ \t]+([0-9]+)" found "${lines}")
    set(${part} "${CMAKE_MATCH_1}")
  endforeach()
  set(version "${MAJOR}.${MINOR}")
  if(MAJOR STREQUAL "")
    # 2.7 says nothing of its version; these functions were new in it
    file(STRINGS "${MINIXML_INCLUDE_DIR}/mxml.h" lines REGEX "mxmlGetFirstChild[ \t]*\\(")
    set(version "before 2.7")
    if(lines)
      set(version 2.7)
    endif()
  endif()
  if(version VERSION_LESS 2.7 OR version VERSION_GREATER_EQUAL 4)
    set(${complaint} "${MINIXML_INCLUDE_DIR}/mxml.h is Mini-XML ${version}, but Quillmark \
uses the interface of 2.7 to 3.x: ${advice}" PARENT_SCOPE)
    return()
  endif()
  set(${complaint} "" PARENT_SCOPE)
  if(NOT CMAKE_FIND_PACKAGE_NAME)
    message(STATUS "Mini-XML with the interface of ${version}: ${MINIXML_LIBRARY}")
  endif()
endfunction()

quillmark_check_mini_xml(quillmark_complaint)
if(quillmark_complaint)
  # whether that is an error is for the caller of find_package to say
  if(CMAKE_FIND_PACKAGE_NAME STREQUAL "quillmark")
    set(quillmark_FOUND FALSE)
    set(quillmark_NOT_FOUND_MESSAGE "${quillmark_complaint}")
    unset(quillmark_complaint)
    return()
  endif()
  message(FATAL_ERROR "${quillmark_complaint}")
endif()
unset(quillmark_complaint)

add_library(MiniXml::MiniXml UNKNOWN IMPORTED)
set_target_properties(MiniXml::MiniXml PROPERTIES
  IMPORTED_LOCATION "${MINIXML_LIBRARY}"
  INTERFACE_INCLUDE_DIRECTORIES "${MINIXML_INCLUDE_DIR}")
