# Read by cpack before it packs: nothing of whoever packs may be in the packages. Files have the date of the commit,
# unless the caller names one, so that two packages of one commit are the same. What was unpacked from an archive of the
# sources has that date on its files.
if(NOT DEFINED ENV{SOURCE_DATE_EPOCH})
  execute_process(COMMAND git log -1 --format=%ct WORKING_DIRECTORY ${CMAKE_CURRENT_LIST_DIR} OUTPUT_VARIABLE date
    OUTPUT_STRIP_TRAILING_WHITESPACE ERROR_QUIET)
  if(NOT date)
    file(TIMESTAMP ${CMAKE_CURRENT_LIST_DIR}/../CHANGELOG.md date "%s" UTC)
  endif()
  set(ENV{SOURCE_DATE_EPOCH} ${date})
endif()
# A zip has dates of no time zone, as they are where it is made.
set(ENV{TZ} UTC)
# Nor is the mask of who packs that of those who install.
file(GLOB_RECURSE packed LIST_DIRECTORIES true ${CPACK_TEMPORARY_DIRECTORY}/*)
foreach(each IN LISTS packed)
  if(IS_DIRECTORY ${each} AND NOT IS_SYMLINK ${each})
    file(CHMOD ${each} PERMISSIONS OWNER_READ OWNER_WRITE OWNER_EXECUTE GROUP_READ GROUP_EXECUTE WORLD_READ WORLD_EXECUTE)
  endif()
endforeach()
