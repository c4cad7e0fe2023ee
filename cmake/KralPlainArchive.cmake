# Read by cpack behind its work: archives get the order of names, and lose whose files were packed.
execute_process(COMMAND ${CPACK_KRAL_PYTHON} -B ${CMAKE_CURRENT_LIST_DIR}/../packaging/plain_archive.py
  $ENV{SOURCE_DATE_EPOCH} ${CPACK_PACKAGE_FILES} COMMAND_ERROR_IS_FATAL ANY)
