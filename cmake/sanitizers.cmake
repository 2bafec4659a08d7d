# DLP_SANITIZE (address,undefined or thread) instruments everything built here; DLP_BUILD_FUZZERS
# instruments it for libFuzzer instead. Both need clang. Included before any target is made.
if(DLP_BUILD_FUZZERS)
  if(DLP_SANITIZE)
    message(FATAL_ERROR "DLP_BUILD_FUZZERS brings its own sanitizers: leave DLP_SANITIZE empty")
  endif()
  # Coverage for libFuzzer everywhere; the harnesses add its main when they link.
  set(dlp_compile_sanitizers fuzzer-no-link,address,undefined)
  set(dlp_link_sanitizers address,undefined)
elseif(DLP_SANITIZE)
  set(dlp_compile_sanitizers ${DLP_SANITIZE})
  set(dlp_link_sanitizers ${DLP_SANITIZE})
else()
  return()
endif()

if(NOT CMAKE_CXX_COMPILER_ID STREQUAL "Clang")
  message(FATAL_ERROR "DLP_SANITIZE and DLP_BUILD_FUZZERS need clang (clang++-14)")
endif()
add_compile_options(-fsanitize=${dlp_compile_sanitizers} -fno-sanitize-recover=all
  -fno-omit-frame-pointer -g)
add_link_options(-fsanitize=${dlp_link_sanitizers})

if(dlp_link_sanitizers MATCHES "address" AND NOT DLP_BUILD_FUZZERS)
  # The shared runtime: a JVM can preload it, and under faketime the clock readings it makes while
  # allocating bypass the preloaded clock.
  execute_process(COMMAND ${CMAKE_CXX_COMPILER} -print-file-name=libclang_rt.asan-x86_64.so
    OUTPUT_VARIABLE asan_runtime OUTPUT_STRIP_TRAILING_WHITESPACE)
  cmake_path(GET asan_runtime PARENT_PATH runtime_directory)
  add_link_options(-shared-libsan "LINKER:-rpath,${runtime_directory}")
  # What a test puts before `java` to load the library: the runtime must be in place before the
  # JVM maps its heap. LeakSanitizer crashes reading the JVM's thread-local storage and finds no
  # root for the JVM's own allocations; those are dropped by their nearest three frames, which
  # keeps the library's leaks in view.
  string(JOIN : jvm_leak_options use_tls=0 malloc_context_size=3
    suppressions=${PROJECT_SOURCE_DIR}/tools/sanitizers/jvm-leaks.supp)
  set(DLP_SANITIZED_JVM env LD_PRELOAD=${asan_runtime} LSAN_OPTIONS=${jvm_leak_options})
else()
  # A static runtime comes with each executable; the shared library leaves its hooks undefined.
  set(DLP_SANITIZER_RUNTIME_IS_STATIC ON)
endif()
