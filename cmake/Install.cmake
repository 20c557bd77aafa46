# What `cmake --install` puts where: the command with its manual page; libzarvo, and for programs that use it its headers
# with what pkg-config and find_package(Zarvo) read; and, for those who extend the runtime, the static library, its
# headers and the CMake package that find_package(Varnex) reads. debian/*.install says what belongs to which package.
include(GNUInstallDirs)
include(CMakePackageConfigHelpers)

install(FILES LICENSE DESTINATION ${CMAKE_INSTALL_DOCDIR})
install(TARGETS Varnex)
install(FILES man/Varnex.1 DESTINATION ${CMAKE_INSTALL_MANDIR}/man1)

install(TARGETS Zarvo EXPORT ZarvoTargets INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})
install(FILES Library/include/zarvo.h Library/include/zarvo.hpp DESTINATION ${CMAKE_INSTALL_INCLUDEDIR})

# Both say where they are by their own place, so that an installed tree can be moved.
cmake_path(RELATIVE_PATH CMAKE_INSTALL_FULL_INCLUDEDIR BASE_DIRECTORY ${CMAKE_INSTALL_FULL_LIBDIR}/pkgconfig
    OUTPUT_VARIABLE ZARVO_INCLUDE_FROM_PKGCONFIG)
configure_file(cmake/zarvo.pc.in zarvo.pc @ONLY)
install(FILES ${PROJECT_BINARY_DIR}/zarvo.pc DESTINATION ${CMAKE_INSTALL_LIBDIR}/pkgconfig)
set(ZARVO_PACKAGE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/Zarvo)
write_basic_package_version_file(ZarvoConfigVersion.cmake COMPATIBILITY SameMajorVersion)
install(EXPORT ZarvoTargets FILE ZarvoConfig.cmake NAMESPACE Zarvo:: DESTINATION ${ZARVO_PACKAGE_DIR})
install(FILES ${PROJECT_BINARY_DIR}/ZarvoConfigVersion.cmake DESTINATION ${ZARVO_PACKAGE_DIR})

install(TARGETS VarnexRuntime EXPORT VarnexTargets INCLUDES DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/varnex)
foreach(folder Runtime Footing PlatformDependent/Linux)
    cmake_path(GET folder PARENT_PATH parent)
    install(DIRECTORY ${folder} DESTINATION ${CMAKE_INSTALL_INCLUDEDIR}/varnex/${parent} FILES_MATCHING PATTERN "*.h")
endforeach()

set(VARNEX_PACKAGE_DIR ${CMAKE_INSTALL_LIBDIR}/cmake/Varnex)
write_basic_package_version_file(VarnexConfigVersion.cmake COMPATIBILITY SameMinorVersion)
install(EXPORT VarnexTargets NAMESPACE Varnex:: DESTINATION ${VARNEX_PACKAGE_DIR})
install(FILES cmake/VarnexConfig.cmake cmake/FindLZ4Library.cmake ${PROJECT_BINARY_DIR}/VarnexConfigVersion.cmake
    DESTINATION ${VARNEX_PACKAGE_DIR})
