# What makes a shipped DLL a release file: a version resource from the one version number,
# bytes that depend only on the sources (no time stamps, no build folder paths), and the
# debug information split off into NAME.dll.debug beside it, found again through a debug link.

# Paths compiled into the binaries (debug information, __FILE__) are written relative, so two
# checkouts in different folders build the same bytes. The build tree is inside the source tree
# for `make`; the more specific map comes last, which GCC tries first.
add_compile_options(-ffile-prefix-map=${CMAKE_SOURCE_DIR}=.
                    -ffile-prefix-map=${CMAKE_BINARY_DIR}=build-${TESSEL_ARCH})
# ld writes the link time into every PE header unless told not to.
add_link_options(-Wl,--no-insert-timestamp)

string(REPLACE "." "," TESSEL_VERSION_COMMAS "${PROJECT_VERSION_MAJOR}.${PROJECT_VERSION_MINOR}.${PROJECT_VERSION_PATCH}")
if(TESSEL_ARCH STREQUAL "x86")
  set(TESSEL_ARCH_TEXT "32-bit Windows (x86)")
else()
  set(TESSEL_ARCH_TEXT "64-bit Windows (x64)")
endif()

# tessel_release_dll(target "description"): the version resource, debug information for the
# split, and the split itself after each link.
function(tessel_release_dll target description)
  get_target_property(name ${target} OUTPUT_NAME)
  set(TESSEL_FILE_NAME ${name}.dll)
  set(TESSEL_DESCRIPTION "${description}")
  set(rc ${CMAKE_CURRENT_BINARY_DIR}/${name}_version.rc)
  configure_file(${CMAKE_SOURCE_DIR}/cmake/release/version.rc.in ${rc} @ONLY)
  target_sources(${target} PRIVATE ${rc})
  target_compile_options(${target} PRIVATE $<$<COMPILE_LANGUAGE:C,CXX>:-g>)
  # objcopy writes a new PE header, stamped with the current time unless SOURCE_DATE_EPOCH
  # says otherwise; 0 is what the linker wrote.
  set(objcopy ${CMAKE_COMMAND} -E env SOURCE_DATE_EPOCH=0 ${TESSEL_MINGW_TRIPLE}-objcopy)
  add_custom_command(TARGET ${target} POST_BUILD
    COMMAND ${objcopy} --only-keep-debug ${name}.dll ${name}.dll.debug
    COMMAND ${objcopy} --strip-all --add-gnu-debuglink=${name}.dll.debug ${name}.dll
    WORKING_DIRECTORY $<TARGET_FILE_DIR:${target}>
    COMMENT "Splitting the debug information of ${name}.dll into ${name}.dll.debug"
    VERBATIM)
endfunction()
