package com.android.server;

/** Administrator settings of DLP: expiry-after durations, the extension list and the lock. */
public final class DLPManagerService {
    static {
        System.loadLibrary("dlp_sdk");
    }

    private DLPManagerService() {}

    /** Files stamped by policy in container {@code id} expire {@code time} seconds later. */
    public static native boolean Native_Dlp_SetDLPExpiry(int id, int time);

    public static native boolean Native_Dlp_SetDLPExtension(int id, String extensions);

    public static native boolean Native_Dlp_UnlockDLP(int id);

    public static native boolean Native_Dlp_LockDLP(int id);
}
