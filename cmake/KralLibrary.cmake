# The library itself: libkral.so.6 on Linux, kral.dll on Windows, from the objects of every layer.
set(KRAL_LAYERS platform frame_base transport frame commands storage download rfcal)

file(WRITE ${CMAKE_CURRENT_BINARY_DIR}/kral_library.cpp "// The library is made of the layers' objects only.\n")
add_library(kral SHARED ${CMAKE_CURRENT_BINARY_DIR}/kral_library.cpp)
add_library(kral::kral ALIAS kral)
kral_link_layers(kral ${KRAL_LAYERS})
target_include_directories(kral INTERFACE
  $<BUILD_INTERFACE:${PROJECT_SOURCE_DIR}/include>
  $<INSTALL_INTERFACE:${CMAKE_INSTALL_INCLUDEDIR}>)
set_target_properties(kral PROPERTIES VERSION ${PROJECT_VERSION} SOVERSION ${PROJECT_VERSION_MAJOR})
if(WIN32)
  # Undecorated, fixed names; a fixed base keeps two builds of one tree byte-identical.
  set_target_properties(kral PROPERTIES PREFIX "" VERSION "" SOVERSION "")
  target_link_options(kral PRIVATE -Wl,--image-base=0x63000000 -Wl,--kill-at)
else()
  target_link_options(kral PRIVATE -Wl,--no-undefined)
endif()
