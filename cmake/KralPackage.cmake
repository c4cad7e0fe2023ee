# Installation and packages: headers, library, tool, CMake package and pkg-config file; the .debs and a Windows zip.
# Each file belongs to a component, which on Linux is a package of its own (KralDebian.cmake).
include(CMakePackageConfigHelpers)

install(TARGETS kral EXPORT kralTargets
  RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT library
  LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT library NAMELINK_COMPONENT development
  ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT development)
if(WIN32)
  install(FILES ${KRAL_MSVC_IMPORT_LIBRARY} DESTINATION ${CMAKE_INSTALL_LIBDIR} COMPONENT development)
endif()
if(TARGET kral_tool)
  install(TARGETS kral_tool RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR} COMPONENT tool)
  if(NOT WIN32)
    # There the loader finds the library by itself, in whatever folder the system has it.
    install(CODE [[
      if(CMAKE_INSTALL_PREFIX MATCHES "(^|/)usr/?$")
        file(RPATH_REMOVE FILE "$ENV{DESTDIR}${CMAKE_INSTALL_PREFIX}/bin/kral")
      endif()]] COMPONENT tool)
    install(FILES packaging/60-kral.rules DESTINATION lib/udev/rules.d COMPONENT tool)
    # The tool itself writes its manual pages.
    set(man_folder ${PROJECT_BINARY_DIR}/package/man1)
    add_custom_command(OUTPUT ${man_folder}/kral.1.gz
      COMMAND ${CMAKE_COMMAND} -E rm -rf ${man_folder}
      COMMAND ${CMAKE_COMMAND} -E make_directory ${man_folder}
      # With folders of whoever reads them, not of whoever builds.
      COMMAND ${CMAKE_COMMAND} -E env --unset=KRAL_CONFIG --unset=XDG_CONFIG_HOME HOME=~
        ${CMAKE_CROSSCOMPILING_EMULATOR} $<TARGET_FILE:kral_tool> help --man ${man_folder}
      COMMAND gzip --best --no-name --recursive ${man_folder}
      DEPENDS kral_tool
      COMMENT "Writing the manual pages"
      VERBATIM)
    add_custom_target(kral_man ALL DEPENDS ${man_folder}/kral.1.gz)
    install(DIRECTORY ${man_folder} DESTINATION ${CMAKE_INSTALL_MANDIR} COMPONENT tool)
  endif()
endif()
install(DIRECTORY include/kral DESTINATION ${CMAKE_INSTALL_INCLUDEDIR} COMPONENT development
  FILES_MATCHING PATTERN "*.h*")
install(DIRECTORY share/kral/wireshark share/kral/commands DESTINATION ${CMAKE_INSTALL_DATADIR}/kral COMPONENT tool)
if(TARGET kral_tool AND NOT WIN32)
  install(FILES share/completion/kral.bash RENAME kral
    DESTINATION ${CMAKE_INSTALL_DATADIR}/bash-completion/completions COMPONENT tool)
  # Where zsh looks for what comes in packages, and for what is installed locally.
  install(CODE "set(kral_zsh \"${PROJECT_SOURCE_DIR}/share/completion/kral.zsh\" ${CMAKE_INSTALL_DATADIR}/zsh)"
    COMPONENT tool)
  install(CODE [[
    list(GET kral_zsh 0 script)
    list(GET kral_zsh 1 folder)
    if(CMAKE_INSTALL_PREFIX MATCHES "(^|/)usr/?$")
      string(APPEND folder /vendor-completions)
    else()
      string(APPEND folder /site-functions)
    endif()
    file(INSTALL ${script} DESTINATION ${CMAKE_INSTALL_PREFIX}/${folder} RENAME _kral)]] COMPONENT tool)
  install(FILES share/completion/kral.fish DESTINATION ${CMAKE_INSTALL_DATADIR}/fish/vendor_completions.d
    COMPONENT tool)
endif()

if(WIN32)
  set(examples_folder examples)
else()
  set(examples_folder ${CMAKE_INSTALL_DATADIR}/doc/libkral-dev/examples)
endif()
install(DIRECTORY examples/ DESTINATION ${examples_folder} COMPONENT development
  REGEX "/examples/CMakeLists[.]txt$" EXCLUDE PATTERN .clang-format EXCLUDE PATTERN __pycache__ EXCLUDE)

set(package_folder ${CMAKE_INSTALL_LIBDIR}/cmake/kral)
install(EXPORT kralTargets NAMESPACE kral:: DESTINATION ${package_folder} COMPONENT development)
configure_package_config_file(cmake/kralConfig.cmake.in ${PROJECT_BINARY_DIR}/package/kralConfig.cmake
  INSTALL_DESTINATION ${package_folder} PATH_VARS CMAKE_INSTALL_LIBDIR)
write_basic_package_version_file(${PROJECT_BINARY_DIR}/package/kralConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
# The package may be moved as a whole: all is found from where the file itself is.
file(RELATIVE_PATH KRAL_PC_PREFIX /prefix/${CMAKE_INSTALL_LIBDIR}/pkgconfig /prefix)
configure_file(cmake/kral.pc.in ${PROJECT_BINARY_DIR}/package/kral.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/package/kralConfig.cmake ${PROJECT_BINARY_DIR}/package/kralConfigVersion.cmake
  DESTINATION ${package_folder} COMPONENT development)
install(FILES ${PROJECT_BINARY_DIR}/package/kral.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig
  COMPONENT development)

set(CPACK_PACKAGE_NAME kral)
set(CPACK_PACKAGE_CONTACT "The kral developers <developers@kral.invalid>")
set(CPACK_PACKAGE_VENDOR kral)
set(CPACK_PRE_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/cmake/KralPackedTree.cmake)
set(CPACK_VERBATIM_VARIABLES ON)
if(NOT WIN32)
  set(CPACK_STRIP_FILES ON)
endif()
if(WIN32)
  set(CPACK_GENERATOR ZIP)
  set(machine x64)
  if(CMAKE_SIZEOF_VOID_P EQUAL 4)
    set(machine x86)
  endif()
  set(CPACK_PACKAGE_FILE_NAME kral-${PROJECT_VERSION}-windows-${machine})
elseif(CMAKE_CROSSCOMPILING)
  # A .deb names the packages that it needs, and this machine has none of the other's.
  set(CPACK_GENERATOR TGZ)
  set(CPACK_PACKAGE_FILE_NAME kral-${PROJECT_VERSION}-linux-${CMAKE_SYSTEM_PROCESSOR})
else()
  include(KralDebian)
endif()
if(NOT CPACK_GENERATOR STREQUAL "DEB" AND KRAL_PYTHON)
  set(CPACK_KRAL_PYTHON ${KRAL_PYTHON})
  set(CPACK_POST_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/cmake/KralPlainArchive.cmake)
endif()
include(CPack)
