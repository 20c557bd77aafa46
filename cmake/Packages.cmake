# What cpack makes: two Debian packages from an installed build, and the release's source from the checkout.
set(CPACK_GENERATOR DEB)
set(CPACK_PACKAGE_VENDOR "Varnex developers")
set(CPACK_PACKAGE_CONTACT "Varnex developers")
set(CPACK_STRIP_FILES ON)

set(CPACK_COMPONENTS_ALL command development)
set(CPACK_DEB_COMPONENT_INSTALL ON)
set(CPACK_DEBIAN_FILE_NAME DEB-DEFAULT)

set(CPACK_DEBIAN_COMMAND_PACKAGE_NAME varnex)
set(CPACK_DEBIAN_COMMAND_PACKAGE_SECTION utils)
set(CPACK_DEBIAN_COMMAND_PACKAGE_SHLIBDEPS ON)
set(CPACK_COMPONENT_COMMAND_DESCRIPTION "The command Varnex writes what an archive holds into a folder of plain files.
It reads the layouts ZarvoFS, ZarvoWeb, ZarvoRaw and ZarvoArchive, their blocks
stored or compressed with LZMA or LZ4.")

set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_NAME libvarnex-dev)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_SECTION libdevel)
set(CPACK_DEBIAN_DEVELOPMENT_PACKAGE_DEPENDS "libstdc++-dev, liblz4-dev") # a static library's are not seen
set(CPACK_COMPONENT_DEVELOPMENT_DESCRIPTION "Development files, for programs that read archives themselves: the static
library, its headers, and the CMake package that find_package(Varnex) reads.")

set(CPACK_SOURCE_GENERATOR TGZ)
set(CPACK_SOURCE_PACKAGE_FILE_NAME varnex-${PROJECT_VERSION})
string(REGEX REPLACE "([][+.*?()^$|])" "\\\\\\1" root "${PROJECT_SOURCE_DIR}")
set(CPACK_SOURCE_IGNORE_FILES
    "^${root}/\\.git(/|$)" "^${root}/build(-[^/]*)?/" "^${root}/\\.cache/" "^${root}/compile_commands\\.json$"
    "^${root}/.*_data/")

set(CPACK_VERBATIM_VARIABLES ON)
include(CPack)
