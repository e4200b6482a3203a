package com.tessaroval.vce;

/** Host stand-in for the application's class that brings the binder service up. */
public class VceService {
    private static volatile int screenOrientation = 0;

    /** Creates and registers the binder service; answers 2. */
    public native int init();

    /** Upcall: the current screen orientation. */
    public static int getScreenOrientation() {
        UpcallLog.record("getScreenOrientation()");
        return screenOrientation;
    }

    public static void setScreenOrientation(int value) {
        screenOrientation = value;
    }
}
