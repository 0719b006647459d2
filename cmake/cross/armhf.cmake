# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

set(CROSS_PROCESSOR arm)
set(CROSS_TRIPLET arm-linux-gnueabihf)
set(CROSS_QEMU qemu-arm)
include(${CMAKE_CURRENT_LIST_DIR}/toolchain.cmake)

# GCC tells of a change of its version 7 wherever a standard container is passed
set(CMAKE_CXX_FLAGS_INIT -Wno-psabi)
