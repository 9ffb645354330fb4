# The 64-bit twin: the same sources configured again with the x86_64 toolchain, in build/x64/,
# built with every build of this tree. Its tests (named x64.*) join this tree's ctest run, so
# one ctest run covers both architectures and ends in one summary.
include(ExternalProject)
set(TESSEL_X64_BUILD ${CMAKE_BINARY_DIR}/x64)
ExternalProject_Add(x64
  SOURCE_DIR ${CMAKE_SOURCE_DIR}
  BINARY_DIR ${TESSEL_X64_BUILD}
  CMAKE_ARGS
    -DCMAKE_TOOLCHAIN_FILE=${CMAKE_SOURCE_DIR}/cmake/toolchain-x86_64-mingw.cmake
    -DCMAKE_BUILD_TYPE=${CMAKE_BUILD_TYPE}
    -DBUILD_TESTING=${BUILD_TESTING}
  INSTALL_COMMAND ""
  BUILD_ALWAYS ON
  EXCLUDE_FROM_ALL OFF)

if(BUILD_TESTING)
  # ctest reads a subdirectory's test file by absolute path as well.
  file(WRITE ${CMAKE_BINARY_DIR}/x64_tests.cmake "subdirs(\"${TESSEL_X64_BUILD}\")\n")
  set_property(DIRECTORY APPEND PROPERTY TEST_INCLUDE_FILES ${CMAKE_BINARY_DIR}/x64_tests.cmake)
endif()
