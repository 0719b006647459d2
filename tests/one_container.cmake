# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# Tests on the virtual device, where that is the container itself: they run one at a
# time, and the other tests beside them. ctest reads this behind the lists of tests;
# without it they would wait for each other inside of their time limits.
execute_process(
  COMMAND ${CMAKE_CURRENT_LIST_DIR}/../device/run
    --build ${CMAKE_CURRENT_BINARY_DIR}/../.. -- printenv QUILLMARK_DEVICE
  OUTPUT_VARIABLE quillmark_device OUTPUT_STRIP_TRAILING_WHITESPACE ERROR_QUIET)
if(quillmark_device STREQUAL in-place)
  foreach(suite device_tests launcher_tests agent_tests fptest_tests)
    foreach(test IN LISTS ${suite}_TESTS)
      set_tests_properties(${test} PROPERTIES RESOURCE_LOCK container)
    endforeach()
  endforeach()
endif()
