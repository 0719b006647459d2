# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# The library as the preset "small" builds it, for each architecture that a g++ is
# here for: QUILLMARK_SMALL_<triplet> names the file, or is empty. The target
# quillmark_small makes them all.
set(small_directory ${PROJECT_BINARY_DIR}/small)
set(small_files)

foreach(triplet x86_64-linux-gnu arm-linux-gnueabihf aarch64-linux-gnu)
  find_program(QUILLMARK_${triplet}_GXX ${triplet}-g++)
  mark_as_advanced(QUILLMARK_${triplet}_GXX)
  set(QUILLMARK_SMALL_${triplet})
  if(QUILLMARK_${triplet}_GXX)
    set(QUILLMARK_SMALL_${triplet} ${small_directory}/${triplet}/libquillmark.so)
    list(APPEND small_files ${QUILLMARK_SMALL_${triplet}})
  endif()
endforeach()

if(NOT TARGET quillmark_small)
  file(GLOB sources CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/src/* ${PROJECT_SOURCE_DIR}/vorlane/*.h)
  # alone: the machine's other headers are not those of another architecture
  configure_file(${MINIXML_INCLUDE_DIR}/mxml.h ${small_directory}/include/mxml.h COPYONLY)
  foreach(file ${small_files})
    get_filename_component(triplet ${file} DIRECTORY)
    get_filename_component(triplet ${triplet} NAME)
    # a shared library need not find here what it uses: other architectures have
    # no Mini-XML here
    set(libraries)
    set(needed)
    if(triplet STREQUAL CMAKE_LIBRARY_ARCHITECTURE)
      set(libraries $<TARGET_FILE:vorlane> ${MINIXML_LIBRARY})
      set(needed vorlane)
    endif()
    add_custom_command(
      OUTPUT ${file}
      COMMAND ${CMAKE_COMMAND} -E make_directory ${small_directory}/${triplet}
      COMMAND ${QUILLMARK_${triplet}_GXX} -std=c++20 -Os -DNDEBUG -fPIC
              -fno-exceptions -fno-rtti -fno-threadsafe-statics -fvisibility=hidden
              -ffile-prefix-map=${PROJECT_SOURCE_DIR}/=
              -I${small_directory}/include -I${PROJECT_SOURCE_DIR}/vorlane
              -shared -Wl,-soname,libquillmark.so.${PROJECT_VERSION_MAJOR} -Wl,--as-needed
              ${QUILLMARK_SMALL_LINK_OPTIONS}
              -o ${file} ${PROJECT_SOURCE_DIR}/src/quillmark.cpp ${libraries}
      DEPENDS ${sources} ${needed}
      VERBATIM)
  endforeach()
  add_custom_target(quillmark_small DEPENDS ${small_files})
endif()
