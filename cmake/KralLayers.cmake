# Every folder of layers.txt that belongs to the library or to the virtual handset, as the object library kral_<folder>
# (transport/line: kral_transport_line): its .cpp files, and those of its posix/ or win32/ subfolder. What it may
# include is what it links. A folder without sources becomes an interface library.
#   KRAL_LAYERS           those of the library
#   KRAL_HANDSET_LAYERS   those of the virtual handset
if(WIN32)
  set(KRAL_LIBRARIES_platform ole32 oleaut32 advapi32 setupapi uuid winmm)
else()
  find_package(PkgConfig REQUIRED)
  pkg_check_modules(xml2 REQUIRED IMPORTED_TARGET GLOBAL libxml-2.0)
  set(KRAL_LIBRARIES_platform PkgConfig::xml2)
endif()
set(KRAL_LIBRARIES_base z)
set(KRAL_LIBRARIES_handset_services z)

if(KRAL_PRECOMPILE)
  file(CONFIGURE OUTPUT ${PROJECT_BINARY_DIR}/generated/precompiled.cpp CONTENT "")
  add_library(kral_precompiled OBJECT ${PROJECT_BINARY_DIR}/generated/precompiled.cpp)
  target_link_libraries(kral_precompiled PRIVATE Threads::Threads kral_compile)
  target_precompile_headers(kral_precompiled PRIVATE ${PROJECT_SOURCE_DIR}/cmake/precompiled.h)
endif()

function(kral_layer name folder arrows)
  file(GLOB sources CONFIGURE_DEPENDS ${PROJECT_SOURCE_DIR}/${folder}/*.cpp
    ${PROJECT_SOURCE_DIR}/${folder}/${KRAL_PLATFORM}/*.cpp)
  list(TRANSFORM arrows REPLACE "/" "_")
  list(TRANSFORM arrows PREPEND kral_)
  if(sources)
    add_library(kral_${name} OBJECT ${sources})
    target_compile_definitions(kral_${name} PRIVATE KRAL_BUILDING)
    target_link_libraries(kral_${name} PUBLIC ${arrows} Threads::Threads
      PRIVATE kral_compile ${KRAL_LIBRARIES_${name}})
    target_include_directories(kral_${name} PUBLIC ${PROJECT_SOURCE_DIR})
    if(KRAL_PRECOMPILE)
      target_precompile_headers(kral_${name} REUSE_FROM kral_precompiled)
    endif()
  else()
    add_library(kral_${name} INTERFACE)
    target_link_libraries(kral_${name} INTERFACE ${arrows})
    target_include_directories(kral_${name} INTERFACE ${PROJECT_SOURCE_DIR})
  endif()
endfunction()

# kral_link_layers(<target> <layer>...): puts the objects of the layers, and the libraries they need, into a target.
function(kral_link_layers target)
  foreach(layer IN LISTS ARGN)
    target_link_libraries(${target} PRIVATE kral_${layer} ${KRAL_LIBRARIES_${layer}})
  endforeach()
endfunction()

set_property(DIRECTORY APPEND PROPERTY CMAKE_CONFIGURE_DEPENDS ${CMAKE_CURRENT_LIST_DIR}/layers.txt)
file(STRINGS ${CMAKE_CURRENT_LIST_DIR}/layers.txt rows REGEX "^[a-z]")
foreach(row IN LISTS rows)
  string(REGEX REPLACE " +" ";" arrows "${row}")
  list(POP_FRONT arrows folder)
  string(REPLACE "/" "_" name ${folder})
  if(folder MATCHES "^(tools|examples|tests|bench|fuzz)")
    continue()
  endif()
  kral_layer(${name} ${folder} "${arrows}")
  if(folder MATCHES "^handset")
    list(APPEND KRAL_HANDSET_LAYERS ${name})
  else()
    list(APPEND KRAL_LAYERS ${name})
  endif()
endforeach()
# The public headers are reached as <kral/...>.
target_include_directories(kral_include INTERFACE ${PROJECT_SOURCE_DIR}/include ${PROJECT_BINARY_DIR}/generated)
configure_file(${PROJECT_SOURCE_DIR}/frame/version.h.in ${PROJECT_BINARY_DIR}/generated/frame/version.h @ONLY)
