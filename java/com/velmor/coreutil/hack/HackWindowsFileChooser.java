package com.velmor.coreutil.hack;

/** The native file open and save dialogs, centred on (centerx, centery). */
public class HackWindowsFileChooser {
    static {
        System.loadLibrary("libTessel_JNI");
    }

    /** Handle of the dialog now shown, written by the library; 0 before the first dialog. */
    public volatile long hwnd;
    /** Screen point on which the dialog is centred. */
    public long centerx;
    public long centery;

    /** Raises a window by handle, for example the dialog in {@link #hwnd}; 0 does nothing. */
    public static native void nativeActivateWindow(long windowHandle);

    /**
     * Shows the open dialog. filters holds description/pattern pairs; the result holds the
     * chosen paths, or is null when the user cancels.
     */
    public native String[] nativeBrowseForFile(
            String[] filters, int filterIndex, String initialDirectory, String title, boolean multipleSelection);

    /** Shows the save dialog; arguments and result as for {@link #nativeBrowseForFile}. */
    public native String[] nativeBrowseForSaveFile(
            String[] filters, int filterIndex, String initialDirectory, String title, boolean multipleSelection);
}
