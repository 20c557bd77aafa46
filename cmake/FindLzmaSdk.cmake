# Finds the LZMA SDK's sources, which Debian's lzma-dev installs beside their headers, and sets LZMA_SDK_DIR: the
# folder that holds LzmaDec.c and LzmaEnc.c. Includes are written <lzma/LzmaDec.h>: the folder itself is never an
# include folder, as other libraries keep headers of common names in it.
find_path(LZMA_SDK_DIR LzmaDec.c PATH_SUFFIXES lzma)

include(FindPackageHandleStandardArgs)
find_package_handle_standard_args(LzmaSdk
    REQUIRED_VARS LZMA_SDK_DIR
    REASON_FAILURE_MESSAGE "The LZMA SDK's LzmaDec.c is needed for LZMA blocks: install it with 'apt-get install lzma-dev'.")
mark_as_advanced(LZMA_SDK_DIR)
