# The arm64 ABI: cmake -DCMAKE_TOOLCHAIN_FILE=cmake/toolchain-arm64.cmake (packages: tools/setup.sh).
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(DLP_COMPILER_PREFIX aarch64-linux-gnu)
set(DLP_TARGET_TRIPLET aarch64-linux-gnu)
include(${CMAKE_CURRENT_LIST_DIR}/debian-multiarch.cmake)
