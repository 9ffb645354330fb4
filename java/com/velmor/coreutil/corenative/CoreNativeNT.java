package com.velmor.coreutil.corenative;

import java.awt.Point;

/** Small Windows desktop services the Java platform lacks. */
public final class CoreNativeNT {
    static {
        System.loadLibrary("libTessel_JNI");
    }

    private CoreNativeNT() {}

    /** The mouse cursor in screen coordinates, or null when Windows cannot tell. */
    public static native Point getCursorPos();

    /** Moves the mouse cursor; true when Windows moved it. */
    public static native boolean setCursorPos(Point position);

    /** The value of one environment variable of the process, or null when it is not defined. */
    public static native String getEnvVariable(String name);

    /** The file-system path of a shell special folder (a CSIDL value), or null. */
    public static native String getSpecialFolderLocation(int folderId);
}
