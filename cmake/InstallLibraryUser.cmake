# install_library_user(TARGET FOLDER) installs a target that is linked with libzarvo. It finds the library by its own place,
# so that it starts below any prefix, and an installed tree can be moved. Packages, whose library lies where the dynamic
# linker looks by itself, set CMAKE_SKIP_INSTALL_RPATH.
include(GNUInstallDirs)

function(install_library_user target folder)
    cmake_path(ABSOLUTE_PATH folder BASE_DIRECTORY ${CMAKE_INSTALL_PREFIX} OUTPUT_VARIABLE place)
    cmake_path(RELATIVE_PATH CMAKE_INSTALL_FULL_LIBDIR BASE_DIRECTORY ${place} OUTPUT_VARIABLE library)
    set_target_properties(${target} PROPERTIES INSTALL_RPATH "$ORIGIN/${library}")
    install(TARGETS ${target} DESTINATION ${folder})
endfunction()
