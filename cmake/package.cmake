# What an installation holds beside the tool: the library, its headers, and how pkg-config, CMake
# and Debian find them. No installed file knows its own prefix: an installation may be moved.
include(CMakePackageConfigHelpers)

set(header_folder ${CMAKE_INSTALL_INCLUDEDIR}/orvalis)
set(cmake_folder ${CMAKE_INSTALL_LIBDIR}/cmake/Orvalis)
set(pkgconfig_folder ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

install(TARGETS orvalis EXPORT Orvalis
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR} INCLUDES DESTINATION ${header_folder})
install(FILES ${ORVALIS_PUBLIC_HEADERS} DESTINATION ${header_folder})
# "copyright" is the name that Debian looks for.
install(FILES LICENSE DESTINATION ${CMAKE_INSTALL_DATAROOTDIR}/doc/orvalis RENAME copyright)

# The library needs no other package, so its targets are the whole configuration.
install(EXPORT Orvalis FILE OrvalisConfig.cmake NAMESPACE Orvalis:: DESTINATION ${cmake_folder})
write_basic_package_version_file(${PROJECT_BINARY_DIR}/OrvalisConfigVersion.cmake
  COMPATIBILITY SameMajorVersion)
install(FILES ${PROJECT_BINARY_DIR}/OrvalisConfigVersion.cmake DESTINATION ${cmake_folder})

set(prefix_from_pc ${CMAKE_INSTALL_PREFIX})
set(libraries_from_prefix ${CMAKE_INSTALL_FULL_LIBDIR})
set(headers_from_prefix ${CMAKE_INSTALL_FULL_INCLUDEDIR}/orvalis)
cmake_path(RELATIVE_PATH prefix_from_pc BASE_DIRECTORY ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig)
cmake_path(RELATIVE_PATH libraries_from_prefix BASE_DIRECTORY ${CMAKE_INSTALL_PREFIX})
cmake_path(RELATIVE_PATH headers_from_prefix BASE_DIRECTORY ${CMAKE_INSTALL_PREFIX})
configure_file(cmake/orvalis.pc.in ${PROJECT_BINARY_DIR}/orvalis.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/orvalis.pc DESTINATION ${pkgconfig_folder})

# A project that includes the sources is packaged by its own rules.
if(PROJECT_IS_TOP_LEVEL)
  # Without dpkg-shlibdeps a Debian package would come out without its dependencies.
  find_program(ORVALIS_SHLIBDEPS dpkg-shlibdeps DOC "Finds what a Debian package depends on")
  mark_as_advanced(ORVALIS_SHLIBDEPS)
  if(ORVALIS_SHLIBDEPS)
    set(CPACK_GENERATOR DEB)
  else()
    set(CPACK_GENERATOR TGZ)
  endif()
  set(CPACK_PACKAGE_NAME orvalis)
  set(CPACK_PACKAGE_VENDOR "Orvalis developers")
  set(CPACK_PACKAGE_CONTACT "Orvalis developers <orvalis@localhost>")
  set(CPACK_STRIP_FILES ON)
  set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
  set(CPACK_DEBIAN_PACKAGE_SECTION sound)
  set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
  set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
  set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY ">=")
  include(CPack)
endif()
