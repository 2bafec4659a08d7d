#pragma once

// Clang checks the library's use of its lock against these marks (-Wthread-safety); other
// compilers know none of the attributes, nor their arguments.
#if defined(__clang__)
#include <android-base/thread_annotations.h>
#else
#define CAPABILITY(x)
#define SCOPED_CAPABILITY
#define GUARDED_BY(x)
#define REQUIRES(...)
#define EXCLUDES(...)
#define ACQUIRE(...)
#define RELEASE(...)
#define NO_THREAD_SAFETY_ANALYSIS
#endif
