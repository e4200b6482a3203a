package com.tessaroval.vce;

/**
 * Loads the library from the application's class loader, as the host
 * application's own classes do (a load from native code without a Java
 * caller would search only the JDK's own library path).
 */
public final class NativeLoader {
    private NativeLoader() {}

    public static void load() {
        System.loadLibrary("quellborn");
    }
}
