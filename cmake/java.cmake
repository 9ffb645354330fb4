# The application's Java classes: compiled into the jar, with the JNI headers generated
# beside them so that the C++ compiler checks each native function against its Java
# declaration. The jar is written by scripts/make-zip, so its bytes depend only on the classes.
find_program(JAVAC_EXECUTABLE javac REQUIRED)
find_program(PYTHON3 python3 REQUIRED)
find_program(JAVAP_EXECUTABLE javap REQUIRED)

get_filename_component(_javac_real ${JAVAC_EXECUTABLE} REALPATH)
get_filename_component(JDK_HOME ${_javac_real} DIRECTORY)
get_filename_component(JDK_HOME ${JDK_HOME} DIRECTORY)
if(NOT EXISTS ${JDK_HOME}/include/jni.h)
  message(FATAL_ERROR "jni.h not found below ${JDK_HOME}")
endif()

file(GLOB_RECURSE TESSEL_JAVA_SOURCES CONFIGURE_DEPENDS ${CMAKE_SOURCE_DIR}/java/*.java)
set(TESSEL_JAVA_CLASSES ${CMAKE_BINARY_DIR}/java/classes)
set(TESSEL_JNI_HEADERS ${CMAKE_BINARY_DIR}/java/jni)
set(TESSEL_JAR ${CMAKE_BINARY_DIR}/java/tessel-coreutil.jar)

add_custom_command(
  OUTPUT ${TESSEL_JAR} ${TESSEL_JNI_HEADERS}/stamp
  COMMAND ${CMAKE_COMMAND} -E rm -rf ${TESSEL_JAVA_CLASSES} ${TESSEL_JNI_HEADERS}
  COMMAND ${JAVAC_EXECUTABLE} --release 8 -Xlint:all,-options -Werror -encoding UTF-8
          -d ${TESSEL_JAVA_CLASSES} -h ${TESSEL_JNI_HEADERS} ${TESSEL_JAVA_SOURCES}
  COMMAND ${PYTHON3} ${CMAKE_SOURCE_DIR}/scripts/make-zip ${TESSEL_JAR} --manifest ${TESSEL_VERSION}
          --dir ${TESSEL_JAVA_CLASSES}
  COMMAND ${CMAKE_COMMAND} -E touch ${TESSEL_JNI_HEADERS}/stamp
  DEPENDS ${TESSEL_JAVA_SOURCES} ${CMAKE_SOURCE_DIR}/scripts/make-zip ${CMAKE_SOURCE_DIR}/VERSION
  COMMENT "Compiling the Java classes and generating JNI headers")
add_custom_target(java_classes DEPENDS ${TESSEL_JAR} ${TESSEL_JNI_HEADERS}/stamp)

# jni.h of the JDK with our win32 jni_md.h found first (stdcall JNICALL, 32-bit jint).
add_library(jni_headers INTERFACE)
target_include_directories(jni_headers INTERFACE
  ${CMAKE_SOURCE_DIR}/cmake/jni-win32 ${JDK_HOME}/include ${TESSEL_JNI_HEADERS})
add_dependencies(jni_headers java_classes)
