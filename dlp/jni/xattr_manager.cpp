// Native methods of com.halvorn.android.zorvat.dlp.XattrManager.
#include <dlp_sdk/expiry_attribute.h>

#include <jni.h>

#include "jni/utf8_chars.h"

extern "C" JNIEXPORT jlong JNICALL
Java_com_halvorn_android_zorvat_dlp_XattrManager_Native_1Dlp_1GetDLPFileExpiryTime(JNIEnv* env,
                                                                                   jobject,
                                                                                   jstring path) {
    dlp::Utf8Chars chars(env, path);
    if (chars.get() == nullptr) return -1;
    return static_cast<jlong>(get_dlp_file_expiry_time(chars.get()));
}
