# What `cmake --install` puts where: the command with its manual page, and, for programs that embed the reader, the
# library, its headers and the CMake package that find_package(Varnex) reads.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

install(TARGETS Varnex COMPONENT command)
install(FILES man/Varnex.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1 COMPONENT command)
install(FILES LICENSE DESTINATION ${CMAKE_INSTALL_DATAROOTDIR}/doc/varnex RENAME copyright COMPONENT command)

install(TARGETS VarnexRuntime EXPORT VarnexTargets COMPONENT development
    INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/varnex)
foreach(folder Runtime Footing PlatformDependent/Linux)
    cmake_path(GET folder PARENT_PATH parent)
    install(DIRECTORY ${folder} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/varnex/${parent} COMPONENT development
        FILES_MATCHING PATTERN "*.h")
endforeach()
install(FILES LICENSE DESTINATION ${CMAKE_INSTALL_DATAROOTDIR}/doc/libvarnex-dev RENAME copyright COMPONENT development)

set(VARNEX_PACKAGE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/Varnex)
write_basic_package_version_file(VarnexConfigVersion.cmake COMPATIBILITY SameMinorVersion)
install(EXPORT VarnexTargets NAMESPACE Varnex:: DESTINATION ${VARNEX_PACKAGE_DIR} COMPONENT development)
install(FILES cmake/VarnexConfig.cmake cmake/FindLZ4Library.cmake ${PROJECT_BINARY_DIR}/VarnexConfigVersion.cmake
    DESTINATION ${VARNEX_PACKAGE_DIR} COMPONENT development)
