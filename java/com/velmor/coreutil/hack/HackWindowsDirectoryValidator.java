package com.velmor.coreutil.hack;

/** Decides, at every change of selection in the folder browser, whether OK is enabled. */
public interface HackWindowsDirectoryValidator {
    boolean validateDirectory(String path);
}
