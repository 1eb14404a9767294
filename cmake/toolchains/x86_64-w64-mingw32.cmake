# Cross-compiles the plugin for 64-bit Windows with MinGW-w64 (Debian's g++-mingw-w64-x86-64).
#   cmake -S . -B build-win64 -DCMAKE_TOOLCHAIN_FILE=cmake/toolchains/x86_64-w64-mingw32.cmake
set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_SYSTEM_PROCESSOR x86_64)

set(TINTWELL_MINGW_TRIPLE x86_64-w64-mingw32)
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
