# Installation: the library with its SONAME links, the public headers, the
# harness tool, the CMake package (Harness::Harness) and harness.pc; and the
# Debian package made from the same files (cpack, see ./run package).
include(CMakePackageConfigHelpers)

set(HARNESS_CMAKE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/Harness)

install(TARGETS Harness EXPORT HarnessTargets
        LIBRARY DESTINATION ${CMAKE_INSTALL_LIBDIR}
        ARCHIVE DESTINATION ${CMAKE_INSTALL_LIBDIR}
        RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
foreach(header ${HARNESS_PUBLIC_HEADERS})
  get_filename_component(folder ${header} DIRECTORY)
  install(FILES ${CMAKE_SOURCE_DIR}/src/${header}
          DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/harness/${folder})
endforeach()
if(TARGET harness-cli)
  install(TARGETS harness-cli RUNTIME DESTINATION ${CMAKE_INSTALL_BINDIR})
endif()

install(EXPORT HarnessTargets NAMESPACE Harness:: FILE HarnessTargets.cmake
        DESTINATION ${HARNESS_CMAKE_DIR})
configure_package_config_file(${CMAKE_SOURCE_DIR}/cmake/HarnessConfig.cmake.in
  ${CMAKE_BINARY_DIR}/HarnessConfig.cmake INSTALL_DESTINATION ${HARNESS_CMAKE_DIR})
# Before 1.0 a minor release may change the interface.
write_basic_package_version_file(${CMAKE_BINARY_DIR}/HarnessConfigVersion.cmake
  COMPATIBILITY SameMinorVersion)
install(FILES ${CMAKE_BINARY_DIR}/HarnessConfig.cmake
              ${CMAKE_BINARY_DIR}/HarnessConfigVersion.cmake
        DESTINATION ${HARNESS_CMAKE_DIR})

# harness.pc names its prefix relative to its own folder, so an installed
# tree still works after it has been moved (or unpacked with dpkg -x).
file(RELATIVE_PATH HARNESS_PC_TO_PREFIX /${CMAKE_INSTALL_LIBDIR}/pkgconfig /)
string(REGEX REPLACE "/$" "" HARNESS_PC_TO_PREFIX "${HARNESS_PC_TO_PREFIX}")
configure_file(${CMAKE_SOURCE_DIR}/cmake/harness.pc.in ${CMAKE_BINARY_DIR}/harness.pc @ONLY)
install(FILES ${CMAKE_BINARY_DIR}/harness.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)

set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_NAME harness)
set(CPACK_PACKAGE_VENDOR "Harness")
set(CPACK_PACKAGE_CONTACT "Harness developers <harness@localhost>")
set(CPACK_PACKAGE_DESCRIPTION_SUMMARY
    "Test runs on Kesto handsets: library, headers and the harness tool")
set(CPACK_PACKAGE_DESCRIPTION
    "Harness drives automated test runs of applications on (emulated) handsets of the Kesto
mobile platform. This package holds the shared library, its headers, the CMake and
pkg-config files to build against it, and the harness command-line tool.")
set(CPACK_PACKAGING_INSTALL_PREFIX /usr)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
set(CPACK_DEBIAN_PACKAGE_SECTION devel)
set(CPACK_STRIP_FILES ON)
# The run-time dependencies (libqt6core6, libqt6xml6, the C++ run time) come
# from the binaries; building against the headers needs Qt's own.
set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS ON)
# A shlibs file for the library it ships, and ldconfig run on installation.
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY ">=")
configure_file(${CMAKE_SOURCE_DIR}/cmake/debian-triggers ${CMAKE_BINARY_DIR}/debian/triggers COPYONLY)
set(CPACK_DEBIAN_PACKAGE_CONTROL_EXTRA ${CMAKE_BINARY_DIR}/debian/triggers)
set(CPACK_DEBIAN_PACKAGE_RECOMMENDS "qt6-base-dev")
set(CPACK_DEBIAN_PACKAGE_SUGGESTS "cmake, pkg-config")
include(CPack)
