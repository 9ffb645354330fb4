# Cross-compiling for 32-bit Windows (x86) with mingw-w64: the main deliverable.
set(CMAKE_SYSTEM_PROCESSOR x86)
set(TESSEL_MINGW_TRIPLE i686-w64-mingw32)
include(${CMAKE_CURRENT_LIST_DIR}/toolchain-mingw.cmake)
