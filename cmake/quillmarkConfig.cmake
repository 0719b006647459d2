# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# find_package(quillmark): quillmark::quillmark, the library and its header.
include("${CMAKE_CURRENT_LIST_DIR}/MiniXml.cmake")
if(TARGET MiniXml::MiniXml)
  include("${CMAKE_CURRENT_LIST_DIR}/quillmarkTargets.cmake")
endif()
