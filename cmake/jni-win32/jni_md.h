/* Machine-dependent JNI types for Windows, x86 and x64 alike, as a Windows JDK defines them
 * (long is 32 bits on both). The JDK found on the build machine is a Linux one, so its own
 * jni_md.h does not fit the target; this one is found first on the include path. On x64
 * the compiler ignores __stdcall: there is one calling convention. */
#ifndef TESSEL_JNI_MD_H
#define TESSEL_JNI_MD_H

#define JNIEXPORT
#define JNIIMPORT
#define JNICALL __stdcall

typedef long jint;
typedef long long jlong;
typedef signed char jbyte;

#endif
