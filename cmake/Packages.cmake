# What cpack makes: Debian packages from an installed build, and the release's source from the checkout.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_VENDOR "Varnex developers")
set(CPACK_PACKAGE_CONTACT "Varnex developers")
set(CPACK_STRIP_FILES ON)

set(CPACK_COMPONENTS_ALL command libzarvo libzarvo-dev development)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)
# Packages of other programs that use libzarvo learn from it what they depend on.
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS ON)
set(CPACK_DEBIAN_PACKAGE_GENERATE_SHLIBS_POLICY ">=")

set(CPACK_DEBIAN_COMMAND_PACKAGE_NAME varnex)
set(CPACK_DEBIAN_COMMAND_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_COMMAND_PACKAGE_SHLIBDEPS ON)
set(CPACK_COMPONENT_COMMAND_DESCRIPTION "The command Varnex writes what an archive holds into a folder of plain files.
It reads the layouts ZarvoFS, ZarvoWeb, ZarvoRaw and ZarvoArchive, their blocks
stored or compressed with LZMA or LZ4.")

set(CPACK_DEBIAN_LIBZARVO_PACKAGE_NAME libzarvo0)
set(CPACK_DEBIAN_LIBZARVO_PACKAGE_SECTION libs)
set(CPACK_DEBIAN_LIBZARVO_PACKAGE_SHLIBDEPS ON)
set(CPACK_COMPONENT_LIBZARVO_DESCRIPTION "Shared library libzarvo reads archives of the Zarvo engine's formats: their entries,
ranges of files from any number of threads, and blocks.")

set(CPACK_DEBIAN_LIBZARVO-DEV_PACKAGE_NAME libzarvo-dev)
set(CPACK_DEBIAN_LIBZARVO-DEV_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_LIBZARVO-DEV_PACKAGE_DEPENDS "libzarvo0 (= ${PROJECT_VERSION})")
set(CPACK_COMPONENT_LIBZARVO-DEV_DESCRIPTION "Development files of libzarvo: zarvo.h for C and zarvo.hpp for C++20, and what
pkg-config and find_package(Zarvo) read.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libvarnex-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "libstdc++-dev, liblz4-dev") # a static library's are not seen
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "Development files of the runtime, for those who extend it: the static library,
its headers, and the CMake package that find_package(Varnex) reads.")

# The command is built only where there is what it needs.
if(TARGET ZarvoProgram)
    list(APPEND CPACK_COMPONENTS_ALL zarvo)
    set(CPACK_DEBIAN_ZARVO_PACKAGE_NAME zarvo)
    set(CPACK_DEBIAN_ZARVO_PACKAGE_SECTION utils)
    set(CPACK_DEBIAN_ZARVO_PACKAGE_SHLIBDEPS ON)
    set(CPACK_DEBIAN_PACKAGE_SHLIBDEPS_PRIVATE_DIRS ${PROJECT_BINARY_DIR}) # where libzarvo is found
    set(CPACK_DEBIAN_ZARVO_PACKAGE_DEPENDS "libzarvo0 (= ${PROJECT_VERSION})")
    set(CPACK_COMPONENT_ZARVO_DESCRIPTION "The command zarvo lists, prints, tests, sums up and extracts what an archive
holds, on all processors.
It reads the layouts ZarvoFS, ZarvoWeb, ZarvoRaw and ZarvoArchive.")
endif()

set(CPACK_SOURCE_GENERATOR TGZ)
set(CPACK_SOURCE_PACKAGE_FILE_NAME varnex-${PROJECT_VERSION})
string(REGEX REPLACE "([][+.*?()^$|])" "\\\\\\1" root "${PROJECT_SOURCE_DIR}")
set(CPACK_SOURCE_IGNORE_FILES
    "^${root}/\\.git(/|$)" "^${root}/build(-[^/]*)?/" "^${root}/\\.cache/" "^${root}/compile_commands\\.json$"
    "^${root}/.*_data/")

set(CPACK_VERBATIM_VARIABLES ON)
include(CPack)
