# Installation and packages: headers, library, tool, CMake package and pkg-config file; a .deb and a Windows zip.
include(CMakePackageConfigHelpers)

install(TARGETS kral EXPORT kralTargets
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR}
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR})
if(WIN32)
  install(FILES ${KRAL_MSVC_IMPORT_LIBRARY} DESTINATION ${CMAKE_INSTALL_LIBDIR})
endif()
if(TARGET kral_tool)
  install(TARGETS kral_tool RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
endif()
install(DIRECTORY include/kral DESTINATION ${CMAKE_INSTALL_INCLUDEDIR} FILES_MATCHING PATTERN "*.h*")
install(DIRECTORY share/kral/wireshark DESTINATION ${CMAKE_INSTALL_DATADIR}/kral)

set(package_folder ${CMAKE_INSTALL_LIBDIR}/cmake/kral)
install(EXPORT kralTargets NAMESPACE kral:: DESTINATION ${package_folder})
configure_package_config_file(cmake/kralConfig.cmake.in ${PROJECT_BINARY_DIR}/package/kralConfig.cmake
  INSTALL_DESTINATION ${package_folder} PATH_VARS CMAKE_INSTALL_LIBDIR)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/package/kralConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
configure_file(cmake/kral.pc.in ${PROJECT_BINARY_DIR}/package/kral.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/package/kralConfig.cmake ${PROJECT_BINARY_DIR}/package/kralConfigVersion.cmake
  DESTINATION ${package_folder})
install(FILES ${PROJECT_BINARY_DIR}/package/kral.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

set(CPACK_PACKAGE_NAME kral)
set(CPACK_PACKAGE_CONTACT "The kral developers <kral@localhost>")
set(CPACK_PACKAGE_VENDOR kral)
set(CPACK_STRIP_FILES ON)
set(CPACK_VERBATIM_VARIABLES ON)
if(WIN32)
  set(CPACK_GENERATOR ZIP)
  set(machine x64)
  if(CMAKE_SIZEOF_VOID_P EQUAL 4)
    set(machine x86)
  endif()
  set(CPACK_PACKAGE_FILE_NAME kral-${PROJECT_VERSION}-windows-${machine})
else()
  set(CPACK_GENERATOR DEB)
  set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
  set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
  set(CPACK_DEBIAN_PACKAGE_SECTION libdevel)
  set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
  # The dynamic loader learns of the library when it is installed.
  file(WRITE ${PROJECT_BINARY_DIR}/package/triggers "activate-noawait ldconfig\n")
  set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${PROJECT_BINARY_DIR}/package/triggers)
endif()
include(CPack)
