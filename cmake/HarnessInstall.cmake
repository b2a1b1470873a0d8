# Installation: the library with its SONAME links, the public headers, the
# harness tool, the CMake package (Harness::Harness) and harness.pc.
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
