/* Machine-dependent JNI types for 32-bit Windows (x86), as a Windows JDK defines them.
 * The JDK found on the build machine is a Linux one, so its own jni_md.h does not fit
 * the target; this one is found first on the include path. */
#ifndef TESSEL_JNI_MD_H
#define TESSEL_JNI_MD_H

#define JNIEXPORT
#define JNIIMPORT
#define JNICALL __stdcall

typedef long jint;
typedef long long jlong;
typedef signed char jbyte;

#endif
