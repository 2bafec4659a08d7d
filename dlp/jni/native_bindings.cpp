#include <dlp_sdk/dlp_device.h>
#include <dlp_sdk/expiry_after_table.h>
#include <dlp_sdk/expiry_attribute.h>

#include <jni.h>

namespace {

// The characters of a Java string for the length of one library call.
class Utf8Chars {
  public:
    Utf8Chars(JNIEnv* env, jstring text)
        : env_(env), text_(text), chars_(text ? env->GetStringUTFChars(text, nullptr) : nullptr) {}
    ~Utf8Chars() {
        if (chars_ != nullptr) env_->ReleaseStringUTFChars(text_, chars_);
    }
    Utf8Chars(const Utf8Chars&) = delete;
    Utf8Chars& operator=(const Utf8Chars&) = delete;

    const char* get() const { return chars_; }

  private:
    JNIEnv* env_;
    jstring text_;
    const char* chars_;
};

}  // namespace

extern "C" {

JNIEXPORT jlong JNICALL
Java_com_halvorn_android_zorvat_dlp_XattrManager_Native_1Dlp_1GetDLPFileExpiryTime(JNIEnv* env,
                                                                                   jobject,
                                                                                   jstring path) {
    Utf8Chars chars(env, path);
    // A null string, or one the VM could not copy (it has then thrown OutOfMemoryError).
    if (chars.get() == nullptr) return -1;
    return static_cast<jlong>(get_dlp_file_expiry_time(chars.get()));
}

JNIEXPORT jboolean JNICALL Java_com_android_server_DLPManagerService_Native_1Dlp_1SetDLPExpiry(
        JNIEnv*, jobject, jint id, jint time) {
    return set_expiryAfter_time(id, time) == 0 ? JNI_TRUE : JNI_FALSE;
}

JNIEXPORT jboolean JNICALL Java_com_android_server_DLPManagerService_Native_1Dlp_1SetDLPExtension(
        JNIEnv* env, jobject, jint id, jstring extensions) {
    Utf8Chars chars(env, extensions);
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
