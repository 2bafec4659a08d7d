#pragma once

#include <jni.h>

namespace dlp {

// The characters of a Java string for the length of one library call. Our own rather than a
// helper that throws: a null string must give the caller a plain failure result.
class Utf8Chars {
  public:
    Utf8Chars(JNIEnv* env, jstring text)
        : env_(env), text_(text), chars_(text ? env->GetStringUTFChars(text, nullptr) : nullptr) {}
    ~Utf8Chars() {
        if (chars_ != nullptr) env_->ReleaseStringUTFChars(text_, chars_);
    }
    Utf8Chars(const Utf8Chars&) = delete;
    Utf8Chars& operator=(const Utf8Chars&) = delete;

    // Null for a null string, or one the VM could not copy (it has then thrown
    // OutOfMemoryError).
    const char* get() const { return chars_; }

  private:
    JNIEnv* env_;
    jstring text_;
    const char* chars_;
};

}  // namespace dlp
