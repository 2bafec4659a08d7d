# The armv7 ABI: cmake -DCMAKE_TOOLCHAIN_FILE=cmake/toolchain-armv7.cmake (packages: tools/setup.sh).
set(CMAKE_SYSTEM_PROCESSOR armv7l)
set(DLP_COMPILER_PREFIX arm-linux-gnueabihf)
set(DLP_TARGET_TRIPLET arm-linux-gnueabihf)
include(${CMAKE_CURRENT_LIST_DIR}/debian-multiarch.cmake)
