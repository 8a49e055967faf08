# Cross-compiles for Windows on x86-64 with mingw-w64 (the posix-thread g++), and
# runs what it builds under wine, in a wine prefix of the build tree's own.
set(CMAKE_SYSTEM_NAME Windows)
set(CMAKE_SYSTEM_PROCESSOR x86_64)

set(ANNO_MINGW_TARGET x86_64-w64-mingw32)
set(CMAKE_C_COMPILER ${ANNO_MINGW_TARGET}-gcc-posix)
set(CMAKE_CXX_COMPILER ${ANNO_MINGW_TARGET}-g++-posix)
set(CMAKE_RC_COMPILER ${ANNO_MINGW_TARGET}-windres)

# Headers and libraries come from the cross environment only; programs from the host.
set(CMAKE_FIND_ROOT_PATH /usr/${ANNO_MINGW_TARGET})
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# Test programs (and GoogleTest's test discovery) run through wine.
set(CMAKE_CROSSCOMPILING_EMULATOR
    ${CMAKE_CURRENT_LIST_DIR}/wine-run.sh ${CMAKE_BINARY_DIR}/wineprefix)
