package com.velmor.coreutil.io;

import com.velmor.coreutil.exception.CoreUtilException;
import java.util.Hashtable;

/**
 * Typed registry access. rootKey is the numeric value of a predefined key, for example
 * HKEY_CURRENT_USER = 0x80000001. Strings, Integers and byte arrays map to REG_SZ, REG_DWORD
 * and REG_BINARY.
 */
public final class WinRegistry {
    static {
        System.loadLibrary("libTessel_JNI");
    }

    public static final int HKEY_CLASSES_ROOT = 0x80000000;
    public static final int HKEY_CURRENT_USER = 0x80000001;
    public static final int HKEY_LOCAL_MACHINE = 0x80000002;

    private WinRegistry() {}

    public static native Object nativeGetRegistryValue(int rootKey, String keyPath, String valueName)
            throws CoreUtilException;

    public static native Hashtable<Object, Object> nativeGetRegistryValues(int rootKey, String keyPath) throws CoreUtilException;

    public static native void nativeSetRegistryValue(int rootKey, String keyPath, String valueName, Object value)
            throws CoreUtilException;

    public static native void nativeSetRegistryValues(int rootKey, String keyPath, Hashtable<Object, Object> values)
            throws CoreUtilException;

    public static native void nativeDeleteRegistryValue(int rootKey, String keyPath, String valueName)
            throws CoreUtilException;

    public static native void nativeDeleteRegistryKey(int rootKey, String keyPath, boolean recursive)
            throws CoreUtilException;
}
