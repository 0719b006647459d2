# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# Mini-XML with the interface of its versions 2.7 to 3.x: MiniXml::MiniXml.
#
# MINIXML_INCLUDE_DIR and MINIXML_LIBRARY name a device's own.

find_path(MINIXML_INCLUDE_DIR mxml.h)
find_library(MINIXML_LIBRARY mxml)
if(NOT MINIXML_INCLUDE_DIR OR NOT MINIXML_LIBRARY)
  message(FATAL_ERROR "Mini-XML is missing: install libmxml-dev, "
    "or set MINIXML_INCLUDE_DIR and MINIXML_LIBRARY")
endif()

file(STRINGS "${MINIXML_INCLUDE_DIR}/mxml.h" lines
  REGEX "^#[ \t]*define[ \t]+MXML_(MAJOR|MINOR)_VERSION[ \t]+[0-9]+")
foreach(part MAJOR MINOR)
  string(REGEX MATCH "MXML_${part}_VERSION[ \t]+([0-9]+)" found "${lines}")
  set(MINIXML_${part} "${CMAKE_MATCH_1}")
endforeach()
set(version "${MINIXML_MAJOR}.${MINIXML_MINOR}")
if(MINIXML_MAJOR STREQUAL "" OR version VERSION_LESS 2.7 OR version VERSION_GREATER_EQUAL 4)
  message(FATAL_ERROR "${MINIXML_INCLUDE_DIR}/mxml.h is Mini-XML ${version}, but Quillmark "
    "uses the interface of 2.7 to 3.x: install libmxml-dev 3.3.1, "
    "or set MINIXML_INCLUDE_DIR and MINIXML_LIBRARY")
endif()
message(STATUS "Mini-XML ${version}: ${MINIXML_LIBRARY}")

add_library(MiniXml::MiniXml UNKNOWN IMPORTED)
set_target_properties(MiniXml::MiniXml PROPERTIES
  IMPORTED_LOCATION "${MINIXML_LIBRARY}"
  INTERFACE_INCLUDE_DIRECTORIES "${MINIXML_INCLUDE_DIR}")
