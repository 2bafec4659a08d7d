# The x86 ABI: cmake -DCMAKE_TOOLCHAIN_FILE=cmake/toolchain-x86.cmake (packages: tools/setup.sh).
set(CMAKE_SYSTEM_PROCESSOR i686)
set(DLP_COMPILER_PREFIX i686-linux-gnu)
set(DLP_TARGET_TRIPLET i386-linux-gnu)
include(${CMAKE_CURRENT_LIST_DIR}/debian-multiarch.cmake)
