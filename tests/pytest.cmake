# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# add_pytest(FILE LABEL [PREFIX prefix] [TIMEOUT seconds] [ENVIRONMENT variable=value...])
#
# Makes one test of a pytest file: X_test.py is PREFIX.X, or else LABEL.X. It is made where
# the tests of test programs are, as ctest begins: side_by_side.cmake finds it in the list
# pytests_TESTS. The python is Debian's, as its package of pytest is for that one.
function(add_pytest file label)
  cmake_parse_arguments(PARSE_ARGV 2 arg "" "PREFIX;TIMEOUT" "ENVIRONMENT")
  if(NOT arg_PREFIX)
    set(arg_PREFIX ${label})
  endif()
  if(NOT arg_TIMEOUT)
    set(arg_TIMEOUT 300)
  endif()
  string(REGEX REPLACE "^(.*/)?([^/]*)_test\\.py$" "${arg_PREFIX}.\\2" name ${file})
  set(script ${CMAKE_CURRENT_BINARY_DIR}/${name}.cmake)
  file(CONFIGURE OUTPUT ${script} @ONLY CONTENT [[
add_test(@name@ /usr/bin/python3 -B -m pytest "@CMAKE_CURRENT_SOURCE_DIR@/@file@")
set_tests_properties(@name@ PROPERTIES
  ENVIRONMENT "QUILLMARK_BUILD=@PROJECT_BINARY_DIR@;@arg_ENVIRONMENT@"
  LABELS @label@ SKIP_RETURN_CODE 77 TIMEOUT @arg_TIMEOUT@)
list(APPEND pytests_TESTS @name@)
]])
  set_property(DIRECTORY APPEND PROPERTY TEST_INCLUDE_FILES ${script})
endfunction()
