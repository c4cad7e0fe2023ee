# kral_tool_libraries: the headers of the libraries of the tool. Found as CMake packages where they are installed as such
# for the platform; otherwise the machine's headers serve. Those are linked into the build tree one by one, so that the
# cross compiler sees these and not the native system headers beside them.
add_library(kral_tool_libraries INTERFACE)

function(kral_tool_library package target folder)
  find_package(${package} QUIET)
  if(TARGET ${target})
    # Of fmt as well: format.cpp is the one file that holds it, so that the tool needs no library of it at run time.
    target_include_directories(kral_tool_libraries SYSTEM INTERFACE
      $<TARGET_PROPERTY:${target},INTERFACE_INCLUDE_DIRECTORIES>)
    return()
  endif()
  if(NOT EXISTS /usr/include/${folder})
    message(FATAL_ERROR "${package} is missing, which the tool needs: scripts/test and scripts/demo install it. "
      "KRAL_TOOL=OFF builds without the tool.")
  endif()
  set(headers ${PROJECT_BINARY_DIR}/headers)
  file(MAKE_DIRECTORY ${headers})
  file(CREATE_LINK /usr/include/${folder} ${headers}/${folder} SYMBOLIC)
  target_include_directories(kral_tool_libraries SYSTEM INTERFACE ${headers})
endfunction()

# Only format.cpp, command_line.cpp, json.cpp and settings.cpp call them: in every file of the tool they cost more time to build than
# the library takes.
kral_tool_library(fmt fmt::fmt fmt)
kral_tool_library(CLI11 CLI11::CLI11 CLI)
kral_tool_library(nlohmann_json nlohmann_json::nlohmann_json nlohmann)
kral_tool_library(tomlplusplus tomlplusplus::tomlplusplus toml++)
