# SPDX-FileCopyrightText: 2026 The Quillmark authors
# SPDX-License-Identifier: Apache-2.0

# What CPack 3.25 cannot say of a Debian package, or says otherwise than Debian
# wants it: each package is taken apart, set right and put together again.
#
# - Multi-Arch is no field that it knows
# - it calls ldconfig in scripts, where the trigger does that
# - its archives are of the order, the times and the umask of this build
foreach(package ${CPACK_PACKAGE_FILES})
  set(tree ${package}.d)
  file(REMOVE_RECURSE ${tree})
  execute_process(COMMAND dpkg-deb --raw-extract ${package} ${tree} COMMAND_ERROR_IS_FATAL ANY)

  file(REMOVE ${tree}/DEBIAN/postinst ${tree}/DEBIAN/postrm)
  set(multi_arch same)
  if(package MATCHES "/fptest_[^/]*$")
    set(multi_arch foreign)
  endif()
  file(READ ${tree}/DEBIAN/control control)
  string(REGEX REPLACE "(\nDescription:)" "\nMulti-Arch: ${multi_arch}\\1" control "${control}")
  file(WRITE ${tree}/DEBIAN/control "${control}")

  execute_process(COMMAND chmod --recursive u=rwX,go=rX ${tree} COMMAND_ERROR_IS_FATAL ANY)
  if(DEFINED ENV{SOURCE_DATE_EPOCH})
    execute_process(
      COMMAND find ${tree} -exec touch --no-dereference --date=@$ENV{SOURCE_DATE_EPOCH} {} +
      COMMAND_ERROR_IS_FATAL ANY)
  endif()
  execute_process(
    COMMAND dpkg-deb --root-owner-group -Zxz --build ${tree} ${package}
    OUTPUT_QUIET COMMAND_ERROR_IS_FATAL ANY)
  file(REMOVE_RECURSE ${tree})
endforeach()
