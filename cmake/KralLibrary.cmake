# The library itself: libkral.so.6 on Linux, kral.dll on Windows, from the objects of every layer.
add_library(kral SHARED)
add_library(kral::kral ALIAS kral)
kral_link_layers(kral ${KRAL_LAYERS})
target_include_directories(kral INTERFACE
  $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}/include>
  $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
set_target_properties(kral PROPERTIES LINKER_LANGUAGE CXX)

if(WIN32)
  # The DLL lies beside the programs that use it: Windows looks there first.
  set_target_properties(kral PROPERTIES RUNTIME_OUTPUT_DIRECTORY ${PROJECT_BINARY_DIR}/bin PREFIX ""
    IMPORT_PREFIX lib)
  enable_language(RC)
  configure_file(cmake/kral.rc.in ${CMAKE_CURRENT_BINARY_DIR}/kral.rc @ONLY)
  target_sources(kral PRIVATE ${CMAKE_CURRENT_BINARY_DIR}/kral.rc)
  if(CMAKE_SIZEOF_VOID_P EQUAL 4)
    set(base 0x63000000)
    set(machine i386)
  else()
    # Above 4 GiB, so that a pointer that was cut to 32 bits leads nowhere.
    set(base 0x263000000)
    set(machine i386:x86-64)
  endif()
  target_link_options(kral PRIVATE -Wl,--image-base=${base}
    -Wl,--output-def=${CMAKE_CURRENT_BINARY_DIR}/kral-ordinals.def)

  # Visual C++ links through a short-form import library of its own. The ordinals are left out of it: they change
  # with every added function, the names do not.
  find_program(KRAL_DLLTOOL NAMES llvm-dlltool llvm-dlltool-14 REQUIRED)
  set(KRAL_MSVC_IMPORT_LIBRARY ${CMAKE_CURRENT_BINARY_DIR}/kral.lib)
  add_custom_command(TARGET kral POST_BUILD
    COMMAND ${CMAKE_COMMAND} -DINPUT=${CMAKE_CURRENT_BINARY_DIR}/kral-ordinals.def
      -DOUTPUT=${CMAKE_CURRENT_BINARY_DIR}/kral.def -P ${PROJECT_SOURCE_DIR}/cmake/StripOrdinals.cmake
    COMMAND ${KRAL_DLLTOOL} -m ${machine} -k -d kral.def -l ${KRAL_MSVC_IMPORT_LIBRARY}
    WORKING_DIRECTORY ${CMAKE_CURRENT_BINARY_DIR}
    BYPRODUCTS ${CMAKE_CURRENT_BINARY_DIR}/kral-ordinals.def ${CMAKE_CURRENT_BINARY_DIR}/kral.def
      ${KRAL_MSVC_IMPORT_LIBRARY}
    VERBATIM)
else()
  set_target_properties(kral PROPERTIES VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
  # Visibility already hides our own symbols; the script also hides what templates of other libraries leave behind.
  # A host that unloads it may have connections open, whose threads run its code: it stays until the process ends.
  target_link_options(kral PRIVATE -Wl,--no-undefined -Wl,-z,nodelete
    -Wl,--version-script=${PROJECT_SOURCE_DIR}/cmake/kral.map)
  set_target_properties(kral PROPERTIES LINK_DEPENDS ${PROJECT_SOURCE_DIR}/cmake/kral.map)
endif()
