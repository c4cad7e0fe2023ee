# kral_layer(<name> [ARROWS <layer>...] [LIBRARIES <target>...])
# One folder of the house as the object library kral_<name>: all its .cpp files, and those of its posix/ or
# win32/ subfolder. ARROWS are the layers it may include. A header-only folder becomes an interface library.
function(kral_layer name)
  cmake_parse_arguments(LAYER "" "" "ARROWS;LIBRARIES" ${ARGN})
  file(GLOB sources CONFIGURE_DEPENDS *.cpp ${KRAL_HOME}/*.cpp)
  list(TRANSFORM LAYER_ARROWS PREPEND kral_)
  if(sources)
    add_library(kral_${name} OBJECT ${sources})
    target_compile_definitions(kral_${name} PRIVATE KRAL_BUILDING)
    target_link_libraries(kral_${name} PUBLIC ${LAYER_ARROWS} Threads::Threads
      PRIVATE kral_compile ${LAYER_LIBRARIES})
    target_include_directories(kral_${name} PUBLIC ${PROJECT_SOURCE_DIR})
    # The libraries themselves are linked where the objects go.
    set_property(TARGET kral_${name} PROPERTY KRAL_LIBRARIES "${LAYER_LIBRARIES}")
  else()
    add_library(kral_${name} INTERFACE)
    target_link_libraries(kral_${name} INTERFACE ${LAYER_ARROWS})
    target_include_directories(kral_${name} INTERFACE ${PROJECT_SOURCE_DIR})
  endif()
endfunction()

# kral_link_layers(<target> <layer>...): puts the objects of the layers, and the libraries they need, into a target.
function(kral_link_layers target)
  foreach(layer IN LISTS ARGN)
    target_link_libraries(${target} PRIVATE kral_${layer})
    get_target_property(type kral_${layer} TYPE)
    if(type STREQUAL "OBJECT_LIBRARY")
      get_property(libraries TARGET kral_${layer} PROPERTY KRAL_LIBRARIES)
      target_link_libraries(${target} PRIVATE ${libraries})
    endif()
  endforeach()
endfunction()
