package com.halvorn.android.zorvat.dlp;

/** Reads the DLP expiry that protected files carry. */
public final class XattrManager {
    static {
        System.loadLibrary("dlp_sdk");
    }

    private XattrManager() {}

    /** The file's expiry in seconds since the epoch, or -1 when the file is not protected. */
    public static native long Native_Dlp_GetDLPFileExpiryTime(String path);
}
