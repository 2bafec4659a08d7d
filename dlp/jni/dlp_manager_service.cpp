// Native methods of com.android.server.DLPManagerService.
#include <dlp_sdk/dlp_device.h>
#include <dlp_sdk/expiry_after_table.h>

#include <jni.h>

#include "jni/utf8_chars.h"

extern "C" {

JNIEXPORT jboolean JNICALL Java_com_android_server_DLPManagerService_Native_1Dlp_1SetDLPExpiry(
        JNIEnv*, jobject, jint id, jint time) {
    return set_expiryAfter_time(id, time) == 0 ? JNI_TRUE : JNI_FALSE;
}

JNIEXPORT jboolean JNICALL Java_com_android_server_DLPManagerService_Native_1Dlp_1SetDLPExtension(
        JNIEnv* env, jobject, jint id, jstring extensions) {
    dlp::Utf8Chars chars(env, extensions);
    if (chars.get() == nullptr) return JNI_FALSE;
    return set_dlp_extension(id, chars.get()) >= 0 ? JNI_TRUE : JNI_FALSE;
}

JNIEXPORT jboolean JNICALL
Java_com_android_server_DLPManagerService_Native_1Dlp_1UnlockDLP(JNIEnv*, jobject, jint id) {
    return unlock_dlp(id) >= 0 ? JNI_TRUE : JNI_FALSE;
}

JNIEXPORT jboolean JNICALL Java_com_android_server_DLPManagerService_Native_1Dlp_1LockDLP(JNIEnv*,
                                                                                          jobject,
                                                                                          jint id) {
    return lock_dlp(id) >= 0 ? JNI_TRUE : JNI_FALSE;
}

}  // extern "C"
