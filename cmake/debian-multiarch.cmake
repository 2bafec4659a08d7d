# Shared by the toolchain files: Debian's cross compiler for DLP_TARGET_TRIPLET, with the target's
# libraries, CMake packages and pkg-config files taken from its multiarch directories.
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_CXX_COMPILER ${DLP_COMPILER_PREFIX}-g++)
set(CMAKE_LIBRARY_ARCHITECTURE ${DLP_TARGET_TRIPLET})
set(ENV{PKG_CONFIG_LIBDIR} /usr/lib/${DLP_TARGET_TRIPLET}/pkgconfig:/usr/share/pkgconfig)
