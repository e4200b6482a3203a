package com.tessaroval.vce;

import android.content.Context;

/** Host stand-in for the application's media engine class: natives and upcalls. */
public class Mme {
    public static native int cfgSetWorkDir(String dir);
    public static native int cfgSetAppCtx(Context context);
    public static native int sysInit();
    public static native int sysDestroy();
    public static native String mmeGetVer();
    public static native int mmeSetLogLevel(int level);
    public static native int captureStatistics(long unused, long streamId, long[] out);
    public static native int zpandModDriveMsg();
    public static native int zpandTimerActive();
    public static native boolean provGetValueBool(String key);
    public static native int provGetValueInt(String key);
    public static native int provGetValueEnum(String key);
    public static native String provGetValueStr(String key);
    public static native String provGetMapStr(String key, int index);
    public static native int startRpcTest();
    public static native int endRpcTest();

    // Upcalls from the media engine's threads.
    static int zpandModPostDrv() {
        return UpcallLog.record("zpandModPostDrv()");
    }

    static int zpandTimerInit() {
        return UpcallLog.record("zpandTimerInit()");
    }

    static int zpandTimerDestroy() {
        return UpcallLog.record("zpandTimerDestroy()");
    }

    static int zpandTimerStart(long length) {
        return UpcallLog.record("zpandTimerStart(" + length + ")");
    }

    static int zpandTimerStop() {
        return UpcallLog.record("zpandTimerStop()");
    }

    static int mvdCodecChanged(long value1, long value2) {
        return UpcallLog.record("mvdCodecChanged(" + value1 + ", " + value2 + ")");
    }

    static int mvdImgOrntChanged(int value1, int value2, int value3) {
        return UpcallLog.record("mvdImgOrntChanged(" + value1 + ", " + value2 + ", " + value3 + ")");
    }

    static int mvdCaptureSizeChanged(int width, int height) {
        return UpcallLog.record("mvdCaptureSizeChanged(" + width + ", " + height + ")");
    }

    static int mvdMagnViewChanged(int value) {
        return UpcallLog.record("mvdMagnViewChanged(" + value + ")");
    }
}
