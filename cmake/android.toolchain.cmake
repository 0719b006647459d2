# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# The NDK's own toolchain file, once it has been found to be there: of a path
# that leads nowhere, CMake says nothing that helps. A relative one would lead
# elsewhere from the directories in which the compiler is tried.
set(complaint)
if(NOT "${QUILLMARK_ANDROID_NDK}" STREQUAL "" AND NOT IS_ABSOLUTE "${QUILLMARK_ANDROID_NDK}")
  set(complaint "is not an absolute path")
elseif(NOT EXISTS "${QUILLMARK_ANDROID_NDK}/build/cmake/android.toolchain.cmake")
  set(complaint "names no NDK")
endif()
if(complaint)
  message(FATAL_ERROR "ANDROID_NDK_ROOT ${complaint}: '${QUILLMARK_ANDROID_NDK}'; "
    "set it to the directory that holds build/cmake/android.toolchain.cmake")
endif()
include("${QUILLMARK_ANDROID_NDK}/build/cmake/android.toolchain.cmake")
# what is compiled to try the compiler reads this file as well; the NDK's own sets the list
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES QUILLMARK_ANDROID_NDK)
