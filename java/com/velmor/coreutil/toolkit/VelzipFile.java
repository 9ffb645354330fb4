package com.velmor.coreutil.toolkit;

/**
 * One Velzip file at a time, and in-memory compression. Failures give false, null, 0 or -1;
 * getErrorIdN and getErrorMsgN then tell which failure was recorded.
 */
public final class VelzipFile {
    static {
        System.loadLibrary("libTessel_JNI");
    }

    private VelzipFile() {}

    public static native void initialize();

    public static native boolean openFileN(String path, boolean forWrite);

    public static native boolean closeFileN();

    public static native String getErrorMsgN();

    public static native int getErrorIdN();

    public static native boolean printLineN(String line);

    public static native int writeDataN(byte[] data, int length);

    public static native int readDataN(byte[] buffer, int length);

    public static native String readLineN();

    public static native int encodeMemN(byte[] dst, int dstSize, byte[] src, int srcSize);

    public static native int decodeMemN(byte[] dst, int dstSize, byte[] src, int srcSize);

    public static native boolean isVelmorZipN();

    public static native boolean isVelmorEncryptedN();

    public static native int getNumCompressedBytesN();

    public static native int getNumCompressedBytesN(byte[] header);

    public static native int getNumUncompressedBytesN();

    public static native int getNumUncompressedBytesN(byte[] header);

    public static native int getNumHeaderBytesN();

    public static native int getSizeofCompressedBuffer(int size, boolean flag1, boolean flag2, boolean flag3);

    public static native int getSizeofUnCompressedBuffer(byte[] header);
}
