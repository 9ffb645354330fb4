package com.velmor.coreutil.hack;

/** The shell folder browser, centred on (centerx, centery). */
public class HackWindowsDirectoryChooser {
    static {
        System.loadLibrary("libTessel_JNI");
    }

    /** Handle of the dialog now shown, written by the library; 0 before the first dialog. */
    public volatile long hwnd;
    public long centerx;
    public long centery;
    /** Text above the folder tree, or null. */
    public String title;
    /** BIF_ flags of the dialog; BIF_STATUSTEXT (4) shows the status line. */
    public long browseFlags;
    /** Folder selected when the dialog opens, or null. */
    public String startpath;
    /** Consulted at every change of selection; null leaves OK as the dialog sets it. */
    public volatile HackWindowsDirectoryValidator validator;

    /** Shows the folder browser; the chosen path, or null when the user cancels. */
    public native String nativeBrowseForFolder();

    /** Sets the status line of the open dialog; may be called from any thread. */
    public native void nativeSetStatus(String status);
}
