# Read by cpack before it packs: files have the date of the commit, unless the caller names one, so that two packages of
# one commit are the same. What was unpacked from an archive of the sources has that date on its files.
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
