# Read by cpack behind its work: gives each .deb what cpack has no words for, and packs it anew. The date is that of
# KralPackedTree.cmake, so that two packages of one commit stay the same.
function(kral_run)
  execute_process(COMMAND ${ARGV} COMMAND_ERROR_IS_FATAL ANY OUTPUT_QUIET)
endfunction()

foreach(deb IN LISTS CPACK_PACKAGE_FILES)
  set(folder ${deb}.contents)
  kral_run(dpkg-deb --raw-extract ${deb} ${folder})
  # Whatever mask the caller has.
  file(CHMOD ${folder} ${folder}/DEBIAN PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE
    WORLD_READ WORLD_EXECUTE)
  set(control ${folder}/DEBIAN/control)
  file(READ ${control} text)
  string(REGEX MATCH "\nPackage: ([^\n]+)\n" line "\n${text}")
  set(multi_arch ${CPACK_KRAL_MULTI_ARCH_${CMAKE_MATCH_1}})
  if(NOT multi_arch)
    message(FATAL_ERROR "${deb}: nothing says which machines it serves")
  endif()
  # By the contents, and not by what they take on the disk of whoever packs.
  file(GLOB_RECURSE packed LIST_DIRECTORIES true ${folder}/usr/*)
  list(LENGTH packed kilobytes)
  foreach(each IN LISTS packed)
    if(NOT IS_DIRECTORY ${each} AND NOT IS_SYMLINK ${each})
      file(SIZE ${each} size)
      math(EXPR kilobytes "${kilobytes} + (${size} + 1023) / 1024 - 1")
    endif()
  endforeach()
  string(REGEX REPLACE "(^|\n)Installed-Size: [0-9]+" "\\1Installed-Size: ${kilobytes}" text "${text}")
  file(WRITE ${control} "Multi-Arch: ${multi_arch}\n${text}")
  # They call ldconfig, for which there is a trigger.
  if(EXISTS ${folder}/DEBIAN/triggers)
    file(REMOVE ${folder}/DEBIAN/postinst ${folder}/DEBIAN/postrm)
  endif()
  kral_run(dpkg-deb --root-owner-group -Zxz --build ${folder} ${deb})
  file(REMOVE_RECURSE ${folder})
endforeach()
