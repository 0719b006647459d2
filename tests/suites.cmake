# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# add_suites(TARGET PREFIX LABEL)
#
# Makes one test of each suite of a GoogleTest program, PREFIX.SUITE: its tests share the
# start of the program, or of the virtual device, which takes longer than they do.
function(add_suites target prefix label)
  get_target_property(sources ${target} SOURCES)
  list(FILTER sources INCLUDE REGEX "_test\\.cpp$")
  set(list)
  foreach(source IN LISTS sources)
    set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${source})
    file(STRINGS ${source} lines REGEX "^TEST(_F|_P)?\\(")
    foreach(line IN LISTS lines)
      string(REGEX REPLACE "^TEST[_FP]*\\(([A-Za-z0-9]+).*" "\\1" suite "${line}")
      list(APPEND suites ${suite})
    endforeach()
  endforeach()
  list(REMOVE_DUPLICATES suites)
  foreach(suite IN LISTS suites)
    string(APPEND list "
add_test(${prefix}.${suite} \"$<TARGET_FILE:${target}>\" --gtest_filter=${suite}.*:*/${suite}.*)
set_tests_properties(${prefix}.${suite} PROPERTIES LABELS ${label} TIMEOUT 300
  SKIP_RETURN_CODE 77 FAIL_REGULAR_EXPRESSION \"Running 0 tests\")
list(APPEND ${target}_TESTS ${prefix}.${suite})")
  endforeach()
  set(script ${CMAKE_CURRENT_BINARY_DIR}/${target}_suites.cmake)
  file(GENERATE OUTPUT ${script} CONTENT "${list}\n")
  set_property(DIRECTORY APPEND PROPERTY TEST_INCLUDE_FILES ${script})
endfunction()
