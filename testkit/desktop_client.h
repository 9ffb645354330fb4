// The CoreNativeNT exports of libTessel_JNI.dll (stdcall, argument bytes after the @), for
// calling them the way Java calls the native methods, through the JNI host.
#pragma once

namespace testkit::desktop {

#define TESTKIT_CN "_Java_com_velmor_coreutil_corenative_CoreNativeNT_"
constexpr char kGetCursorPos[] = TESTKIT_CN "getCursorPos@8";
constexpr char kSetCursorPos[] = TESTKIT_CN "setCursorPos@12";
constexpr char kGetEnv[] = TESTKIT_CN "getEnvVariable@12";
constexpr char kSpecialFolder[] = TESTKIT_CN "getSpecialFolderLocation@12";
#undef TESTKIT_CN

}  // namespace testkit::desktop
