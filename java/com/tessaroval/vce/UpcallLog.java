package com.tessaroval.vce;

import java.util.ArrayList;
import java.util.List;

/**
 * What the native side asked of the Java side: each upcall is recorded as
 * "name(args) on thread" so tests can read it back, and can be made to throw.
 */
public final class UpcallLog {
    private static final List<String> calls = new ArrayList<>();
    private static volatile int result = 0;
    private static volatile boolean throwing = false;

    private UpcallLog() {}

    static synchronized int record(String call) {
        calls.add(call + " on " + Thread.currentThread().getName());
        if (throwing) {
            throw new IllegalStateException("upcall failed: " + call);
        }
        return result;
    }

    public static synchronized List<String> calls() {
        return new ArrayList<>(calls);
    }

    public static synchronized String[] callArray() {
        return calls.toArray(new String[0]);
    }

    public static synchronized void clear() {
        calls.clear();
    }

    /** The int every upcall answers. */
    public static void setResult(int value) {
        result = value;
    }

    /** Makes every upcall throw after recording itself. */
    public static void setThrowing(boolean value) {
        throwing = value;
    }
}
