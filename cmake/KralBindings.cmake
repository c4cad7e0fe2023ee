# What other languages need, made from the public headers while the library is built: in bindings/ of the build folder
# the description (kral.json), Kral.cs and the header for LabVIEW, in python/ the Python package.
# Debian's own interpreter first: its packages are what the scripts install.
find_program(KRAL_PYTHON python3 PATHS /usr/bin NO_DEFAULT_PATH)
find_program(KRAL_PYTHON python3)
if(KRAL_PYTHON)
  execute_process(COMMAND ${KRAL_PYTHON} -c "import pycparser" RESULT_VARIABLE lacks_pycparser OUTPUT_QUIET ERROR_QUIET)
endif()
if(NOT KRAL_PYTHON OR lacks_pycparser)
  if(KRAL_TESTS)
    message(FATAL_ERROR "python3 with pycparser (Debian: python3-pycparser) is missing: the tests need the bindings")
  endif()
  message(STATUS "python3 with pycparser is missing: nothing is made for other languages")
  return()
endif()

set(KRAL_BINDINGS_DIR ${PROJECT_BINARY_DIR}/bindings)
set(KRAL_PYTHON_PACKAGE_DIR ${PROJECT_BINARY_DIR}/python)
file(GLOB headers CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/include/kral/*.h)
file(GLOB makers CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/bindings/*.py
  ${PROJECT_SOURCE_DIR}/bindings/*.cs)
file(GLOB_RECURSE package_files CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/python/*.py ${PROJECT_SOURCE_DIR}/python/*.toml
  ${PROJECT_SOURCE_DIR}/python/*.md ${PROJECT_SOURCE_DIR}/python/py.typed)
add_custom_command(OUTPUT ${KRAL_BINDINGS_DIR}/Kral.cs ${KRAL_PYTHON_PACKAGE_DIR}/kral/_api.py
  BYPRODUCTS ${KRAL_BINDINGS_DIR}/kral.json ${KRAL_BINDINGS_DIR}/_api.py ${KRAL_BINDINGS_DIR}/kral_labview.h
  # Without writing byte code into the sources.
  COMMAND ${KRAL_PYTHON} -B ${PROJECT_SOURCE_DIR}/bindings/describe.py ${PROJECT_SOURCE_DIR}/include/kral
    ${KRAL_BINDINGS_DIR}
  COMMAND ${CMAKE_COMMAND} -E rm -rf ${KRAL_PYTHON_PACKAGE_DIR}
  COMMAND ${CMAKE_COMMAND} -E copy_directory ${PROJECT_SOURCE_DIR}/python ${KRAL_PYTHON_PACKAGE_DIR}
  COMMAND ${CMAKE_COMMAND} -E copy ${KRAL_BINDINGS_DIR}/_api.py ${KRAL_PYTHON_PACKAGE_DIR}/kral/_api.py
  DEPENDS ${headers} ${makers} ${package_files}
  COMMENT "Making the bindings from the public headers"
  VERBATIM)
add_custom_target(kral_bindings ALL DEPENDS ${KRAL_BINDINGS_DIR}/Kral.cs ${KRAL_PYTHON_PACKAGE_DIR}/kral/_api.py)

install(FILES ${KRAL_BINDINGS_DIR}/Kral.cs ${KRAL_BINDINGS_DIR}/kral_labview.h
  DESTINATION ${CMAKE_INSTALL_DATADIR}/kral COMPONENT development)
if(WIN32)
  set(python_folder python)
else()
  set(python_folder lib/python3/dist-packages)
endif()
install(DIRECTORY ${KRAL_PYTHON_PACKAGE_DIR}/kral DESTINATION ${python_folder} COMPONENT python
  PATTERN __pycache__ EXCLUDE)
