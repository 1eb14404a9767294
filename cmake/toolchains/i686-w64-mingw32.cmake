# Cross-compiles the plugin for 32-bit Windows with MinGW-w64 (Debian's g++-mingw-w64-i686).
#   cmake -S . -B build-win32 -DCMAKE_TOOLCHAIN_FILE=cmake/toolchains/i686-w64-mingw32.cmake
set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_SYSTEM_PROCESSOR i686)

set(TINTWELL_MINGW_TRIPLE i686-w64-mingw32)
set(CMAKE_C_COMPILER ${TINTWELL_MINGW_TRIPLE}-gcc)
set(CMAKE_CXX_COMPILER ${TINTWELL_MINGW_TRIPLE}-g++)
set(CMAKE_RC_COMPILER ${TINTWELL_MINGW_TRIPLE}-windres)

set(CMAKE_FIND_ROOT_PATH /usr/${TINTWELL_MINGW_TRIPLE})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# libpng, libjpeg and libtiff have no MinGW builds here; the plugin needs none of them.
set(TINTWELL_IMAGE_FILES OFF CACHE BOOL "Read and write PNG, JPEG and TIFF files" FORCE)
