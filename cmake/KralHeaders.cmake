# Header-only libraries of the tool, taken from the machine's packages on both platforms. Linked into the build tree one
# by one, so that the cross compiler sees these and not the native system headers beside them.
set(KRAL_HEADERS_DIR ${PROJECT_BINARY_DIR}/headers)
file(MAKE_DIRECTORY ${KRAL_HEADERS_DIR})
foreach(package fmt CLI nlohmann)
  if(NOT EXISTS /usr/include/${package})
    message(FATAL_ERROR "/usr/include/${package} is missing: scripts/test and scripts/demo install what is needed")
  endif()
  file(CREATE_LINK /usr/include/${package} ${KRAL_HEADERS_DIR}/${package} SYMBOLIC)
endforeach()
add_library(kral_headers INTERFACE)
target_include_directories(kral_headers SYSTEM INTERFACE ${KRAL_HEADERS_DIR})
target_compile_definitions(kral_headers INTERFACE FMT_HEADER_ONLY)
