# The reference: HTML made by Doxygen from the public headers, the pages of docs/ and the examples. Part of a release
# build where Doxygen is installed; a warning is an error where the compiler's are.
find_program(KRAL_DOXYGEN doxygen)
if(KRAL_DOXYGEN AND TARGET kral_bindings AND CMAKE_BUILD_TYPE STREQUAL "Release")
  set(made_by_default ON)
else()
  set(made_by_default OFF)
endif()
option(KRAL_REFERENCE "Make the reference (Doxygen)" ${made_by_default})
if(NOT KRAL_REFERENCE)
  return()
endif()

set(KRAL_REFERENCE_DIR ${PROJECT_BINARY_DIR}/reference)
set(KRAL_REFERENCE_FILTER "${KRAL_PYTHON} -B ${PROJECT_SOURCE_DIR}/docs/reference/filter.py \
${KRAL_BINDINGS_DIR}/kral.json ${PROJECT_SOURCE_DIR}/examples")
if(KRAL_WERROR)
  set(KRAL_REFERENCE_WARNINGS FAIL_ON_WARNINGS)
else()
  set(KRAL_REFERENCE_WARNINGS NO)
endif()
configure_file(docs/reference/Doxyfile.in ${PROJECT_BINARY_DIR}/reference.doxyfile @ONLY)
file(GLOB_RECURSE reference_sources CONFIGURE_DEPENDS include/kral/*.h* docs/*.md docs/reference/* examples/*.c
  examples/*.cpp examples/*.cs python/README.md)
add_custom_command(OUTPUT ${KRAL_REFERENCE_DIR}/html/index.html
  COMMAND ${CMAKE_COMMAND} -E rm -rf ${KRAL_REFERENCE_DIR}
  COMMAND ${CMAKE_COMMAND} -E make_directory ${KRAL_REFERENCE_DIR}
  COMMAND ${KRAL_DOXYGEN} ${PROJECT_BINARY_DIR}/reference.doxyfile
  DEPENDS ${reference_sources} ${PROJECT_BINARY_DIR}/reference.doxyfile ${KRAL_BINDINGS_DIR}/Kral.cs
  COMMENT "Making the reference"
  VERBATIM)
add_custom_target(kral_reference ALL DEPENDS ${KRAL_REFERENCE_DIR}/html/index.html)

if(WIN32)
  install(DIRECTORY ${KRAL_REFERENCE_DIR}/html DESTINATION doc COMPONENT documentation)
  install(FILES CHANGELOG.md DESTINATION doc COMPONENT documentation)
else()
  install(DIRECTORY ${KRAL_REFERENCE_DIR}/html DESTINATION ${CMAKE_INSTALL_DATADIR}/doc/kral-doc
    COMPONENT documentation)
endif()
