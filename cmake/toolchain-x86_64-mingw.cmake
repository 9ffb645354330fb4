# Cross-compiling for 64-bit Windows (x64) with mingw-w64: the twin for 64-bit JVMs.
set(CMAKE_SYSTEM_PROCESSOR AMD64)
set(TESSEL_MINGW_TRIPLE x86_64-w64-mingw32)
include(${CMAKE_CURRENT_LIST_DIR}/toolchain-mingw.cmake)
