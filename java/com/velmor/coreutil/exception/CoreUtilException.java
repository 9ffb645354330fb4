package com.velmor.coreutil.exception;

/** Raised by the registry methods with a fixed message naming what failed. */
public class CoreUtilException extends Exception {
    private static final long serialVersionUID = 1L;

    public CoreUtilException(String message) {
        super(message);
    }
}
