# How every target is compiled: language level, warnings, sanitizers, and the baseline of each machine.
set(CMAKE_CXX_STANDARD 20)
set(CMAKE_CXX_STANDARD_REQUIRED ON)
set(CMAKE_CXX_EXTENSIONS OFF)
set(CMAKE_C_STANDARD 90)
set(CMAKE_C_EXTENSIONS OFF)
set(CMAKE_POSITION_INDEPENDENT_CODE ON)
set(CMAKE_CXX_VISIBILITY_PRESET hidden)
set(CMAKE_C_VISIBILITY_PRESET hidden)
set(CMAKE_VISIBILITY_INLINES_HIDDEN ON)
set(CMAKE_EXPORT_COMPILE_COMMANDS ON)
# The same doubles on every machine: where a multiplication could be fused with an addition, it is not.
add_compile_options(-ffp-contract=off)
# Nothing of what is delivered holds, or depends on the length of, the name of the folder that it was built in.
set(CMAKE_BUILD_RPATH_USE_ORIGIN ON)
add_compile_options($<$<CONFIG:Release,RelWithDebInfo>:-ffile-prefix-map=${PROJECT_SOURCE_DIR}=.>)

add_library(kral_compile INTERFACE)
target_compile_options(kral_compile INTERFACE
  $<$<COMPILE_LANGUAGE:CXX>:-Wall -Wextra -Wpedantic -Wshadow -Wconversion -Wsign-conversion
    -Wnon-virtual-dtor -Wold-style-cast -Woverloaded-virtual -Wimplicit-fallthrough>
  $<$<COMPILE_LANGUAGE:C>:-Wall -Wextra -Wpedantic>)
if(CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
  # It takes format strings for its own printf only, and says so wherever the GNU one is named.
  target_compile_options(kral_compile INTERFACE -Wno-ignored-attributes)
endif()
if(CMAKE_CXX_COMPILER_ID STREQUAL "GNU" AND CMAKE_CXX_COMPILER_VERSION VERSION_LESS 13)
  # Optimising, GCC 12 sees overlapping copies in "text" + string where none can be.
  target_compile_options(kral_compile INTERFACE $<$<AND:$<COMPILE_LANGUAGE:CXX>,$<CONFIG:Release>>:-Wno-restrict>)
endif()
if(KRAL_WERROR)
  target_compile_options(kral_compile INTERFACE -Werror)
endif()

if(KRAL_SANITIZE)
  add_compile_options(-fsanitize=${KRAL_SANITIZE} -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${KRAL_SANITIZE})
  if(KRAL_SANITIZE MATCHES "undefined")
    add_compile_options(-fno-sanitize-recover=all)
  endif()
  if(KRAL_SANITIZE MATCHES "address")
    # The leak check guesses where a library that was loaded at run time has its thread-local variables, and now and then
    # reads where nothing is. With the model of libraries that are loaded at the start there is nothing to guess.
    add_compile_options(-ftls-model=initial-exec)
  endif()
endif()

if(WIN32)
  set(KRAL_PLATFORM win32)
  if(CMAKE_SIZEOF_VOID_P EQUAL 4)
    # SSE2 is the baseline, and SSE arithmetic gives the same doubles as with 64 bits, where both are the rule. Callers
    # may keep only 4-byte stack alignment, hence -mstackrealign.
    add_compile_options(-msse2 -mfpmath=sse -mstackrealign)
  endif()
  add_compile_definitions(_WIN32_WINNT=0x0601 WIN32_LEAN_AND_MEAN NOMINMAX __USE_MINGW_ANSI_STDIO=1)
  # The runtimes are linked in: every program and the DLL are one file. They do not tell when they were linked; strip
  # would put that back, so what is delivered leaves the linker without symbols.
  add_link_options(-static -Wl,--no-insert-timestamp $<$<CONFIG:Release>:-s>)
else()
  set(KRAL_PLATFORM posix)
endif()

# kral_unite(<target>): with CMAKE_UNITY_BUILD the files of a folder are compiled as one, which halves the time of a whole
# build. So what a folder's files keep to themselves needs different names.
function(kral_unite target)
  get_target_property(sources ${target} SOURCES)
  set_target_properties(${target} PROPERTIES UNITY_BUILD_MODE GROUP)
  foreach(source IN LISTS sources)
    cmake_path(GET source PARENT_PATH folder)
    cmake_path(RELATIVE_PATH folder BASE_DIRECTORY ${PROJECT_SOURCE_DIR})
    string(MAKE_C_IDENTIFIER "${folder}" folder)
    set_source_files_properties(${source} PROPERTIES UNITY_GROUP ${folder})
  endforeach()
endfunction()
