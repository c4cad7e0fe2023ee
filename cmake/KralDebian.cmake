# The .debs, as a distribution divides them: one for each component.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_COMPONENTS_ALL library development)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY "")  # each has its own, which would stand below this one
set(CPACK_DEBIAN_PACKAGE_RELEASE 0kral1)  # nobody's but ours
set(CPACK_DEBIAN_PACKAGE_PRIORITY optional)
set(CPACK_DEBIAN_PACKAGE_CONTROL_STRICT_PERMISSION ON)
set(CPACK_DEBIAN_PACKAGE_SOURCE kral)
set(CPACK_POST_BUILD_SCRIPTS ${PROJECT_SOURCE_DIR}/cmake/KralDebianControl.cmake)
set(KRAL_DEBIAN_VERSION ${PROJECT_VERSION}-${CPACK_DEBIAN_PACKAGE_RELEASE})

# What each package has in share/doc. Its date is that of the commit, so that two builds of it are the same.
if(NOT DEFINED ENV{SOURCE_DATE_EPOCH})
  execute_process(COMMAND git log -1 --format=%ct WORKING_DIRECTORY ${PROJECT_SOURCE_DIR} OUTPUT_VARIABLE commit_time
    OUTPUT_STRIP_TRAILING_WHITESPACE ERROR_QUIET)
  if(commit_time)
    set(ENV{SOURCE_DATE_EPOCH} ${commit_time})
  endif()
endif()
string(TIMESTAMP KRAL_PACKAGE_DATE "%a, %d %b %Y %H:%M:%S +0000" UTC)
if(commit_time)
  unset(ENV{SOURCE_DATE_EPOCH})
endif()
set(debian_folder ${PROJECT_BINARY_DIR}/package/debian)
configure_file(packaging/debian/changelog.in ${debian_folder}/changelog.Debian @ONLY)
configure_file(CHANGELOG.md ${debian_folder}/changelog COPYONLY)
execute_process(COMMAND gzip --best --no-name --keep --force changelog changelog.Debian
  WORKING_DIRECTORY ${debian_folder} COMMAND_ERROR_IS_FATAL ANY)

# kral_debian_package(COMPONENT NAME SECTION MULTI_ARCH "summary" "more"): the package of a component. MULTI_ARCH is
# "same" for what lies beside that of another machine, "foreign" for what serves programs of every machine.
function(kral_debian_package component name section multi_arch summary text)
  string(TOUPPER ${component} upper)
  set(prefix CPACK_DEBIAN_${upper})
  set(${prefix}_PACKAGE_NAME ${name} PARENT_SCOPE)
  set(${prefix}_PACKAGE_SECTION ${section} PARENT_SCOPE)
  set(CPACK_KRAL_MULTI_ARCH_${name} ${multi_arch} PARENT_SCOPE)
  set(${prefix}_DESCRIPTION "${summary}\n${text}" PARENT_SCOPE)
  install(FILES ${debian_folder}/changelog.gz ${debian_folder}/changelog.Debian.gz
    ${PROJECT_SOURCE_DIR}/packaging/debian/copyright DESTINATION share/doc/${name} COMPONENT ${component}
    EXCLUDE_FROM_ALL)
endfunction()

# --- libkral6: the library, with its symbols -------------------------------------------------------------------------

set(soname_package libkral${PROJECT_VERSION_MAJOR})
set(about "kral drives the diagnostic interface of mobile handsets from a PC: identity,
factory test, NV items and their backups, files, logs, software download.")
kral_debian_package(library ${soname_package} libs same "manufacturing and test support for mobile handsets" "${about}")
set(CPACK_DEBIAN_LIBRARY_PACKAGE_SHLIBDEPS ON)
# Functions are added between releases, so all of them ask for the version that a program was built with.
file(STRINGS docs/exports.txt functions REGEX "^function ")
list(TRANSFORM functions REPLACE "^function [a-zA-Z0-9_]+ (KRAL_[A-Za-z0-9_]+)\\(.*" " \\1@Base ${PROJECT_VERSION}")
list(JOIN functions "\n" functions)
file(WRITE ${debian_folder}/symbols
  "libkral.so.${PROJECT_VERSION_MAJOR} ${soname_package} #MINVER#\n* Build-Depends-Package: libkral-dev\n${functions}\n")
file(WRITE ${debian_folder}/shlibs
  "libkral ${PROJECT_VERSION_MAJOR} ${soname_package} (>= ${PROJECT_VERSION})\n")
# The dynamic loader learns of the library when it is installed.
configure_file(packaging/debian/libkral6.triggers ${debian_folder}/triggers COPYONLY)
set(CPACK_DEBIAN_LIBRARY_PACKAGE_CONTROL_EXTRA ${debian_folder}/symbols ${debian_folder}/shlibs
  ${debian_folder}/triggers)

kral_debian_package(development libkral-dev libdevel same "files for programs that use kral"
  "${about}
Here are the headers, the link for the linker, files for CMake and
pkg-config, Kral.cs for C#, and a header for LabVIEW.")
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "${soname_package} (= ${KRAL_DEBIAN_VERSION})")

if(TARGET kral_tool)
  list(APPEND CPACK_COMPONENTS_ALL tool)
  kral_debian_package(tool kral comm foreign "tool for mobile handsets in production and test"
    "${about}\nThis is the command-line tool, with a virtual handset to try it on.")
  set(CPACK_DEBIAN_TOOL_PACKAGE_SHLIBDEPS ON)
  set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${PROJECT_BINARY_DIR})
  set(CPACK_DEBIAN_TOOL_PACKAGE_DEPENDS "${soname_package} (= ${KRAL_DEBIAN_VERSION})")
endif()

if(TARGET kral_reference)
  list(APPEND CPACK_COMPONENTS_ALL documentation)
  kral_debian_package(documentation kral-doc doc foreign "reference of kral"
    "${about}
These are its functions, guides, examples and errors as HTML.")
  set(CPACK_DEBIAN_DOCUMENTATION_PACKAGE_ARCHITECTURE all)
  install(FILES packaging/debian/kral-doc.doc-base DESTINATION share/doc-base COMPONENT documentation RENAME kral-doc
    EXCLUDE_FROM_ALL)
endif()

if(TARGET kral_bindings)
  list(APPEND CPACK_COMPONENTS_ALL python)
  kral_debian_package(python python3-kral python foreign
    "manufacturing and test support for mobile handsets (Python 3)"
    "${about}\nThis is the package for Python, with fixtures for pytest.")
  set(CPACK_DEBIAN_PYTHON_PACKAGE_ARCHITECTURE all)
  set(CPACK_DEBIAN_PYTHON_PACKAGE_DEPENDS "python3:any (>= 3.9), ${soname_package} (>= ${PROJECT_VERSION})")
  set(CPACK_DEBIAN_PYTHON_PACKAGE_SUGGESTS "python3-pytest, kral")
  set(maintainer_scripts "")
  foreach(script postinst prerm)
    configure_file(packaging/debian/python3-kral.${script} ${debian_folder}/${script} COPYONLY)
    list(APPEND maintainer_scripts ${debian_folder}/${script})
  endforeach()
  set(CPACK_DEBIAN_PYTHON_PACKAGE_CONTROL_EXTRA ${maintainer_scripts})
  # What a wheel would tell pytest: that there is a plugin.
  set(egg_info ${PROJECT_BINARY_DIR}/package/kral-${PROJECT_VERSION}.egg-info)
  file(WRITE ${egg_info}/PKG-INFO "Metadata-Version: 2.1\nName: kral\nVersion: ${PROJECT_VERSION}\n")
  file(WRITE ${egg_info}/entry_points.txt "[pytest11]\nkral = kral.pytest_plugin\n")
  install(DIRECTORY ${egg_info} DESTINATION lib/python3/dist-packages COMPONENT python)
endif()
