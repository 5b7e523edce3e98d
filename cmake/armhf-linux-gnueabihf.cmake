# Cross build for 32-bit ARM Linux (Debian armhf: ARMv7-A, VFPv3-D16, hard
# float) with Debian's crossbuild-essential-armhf; tests run under qemu-arm.
#   cmake -S . -B build-armhf -DCMAKE_TOOLCHAIN_FILE=cmake/armhf-linux-gnueabihf.cmake
# Libraries come from the armhf multiarch directories (/usr/lib/arm-linux-gnueabihf)
# when installed there; Eigen and Boost are used as headers only, and
# GoogleTest is built from /usr/src/googletest when no armhf build of it is
# installed (see tests/CMakeLists.txt).
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR arm)
set(QUORIN_CROSS_TRIPLE arm-linux-gnueabihf)

set(CMAKE_C_COMPILER ${QUORIN_CROSS_TRIPLE}-gcc)
set(CMAKE_CXX_COMPILER ${QUORIN_CROSS_TRIPLE}-g++)
set(CMAKE_ASM_COMPILER ${QUORIN_CROSS_TRIPLE}-gcc)
set(CMAKE_LIBRARY_ARCHITECTURE ${QUORIN_CROSS_TRIPLE})

# Programs (the model packer's Python, the tools) are the build machine's;
# libraries and headers are searched in the target's places first.
set(CMAKE_FIND_ROOT_PATH /usr/${QUORIN_CROSS_TRIPLE} /)
set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE BOTH)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE BOTH)

# ctest and gtest_discover_tests run the test programs through user-mode qemu,
# with the cross toolchain's runtime as the target's root.
find_program(QUORIN_QEMU_ARM qemu-arm)
if(QUORIN_QEMU_ARM)
  set(CMAKE_CROSSCOMPILING_EMULATOR ${QUORIN_QEMU_ARM};-L;/usr/${QUORIN_CROSS_TRIPLE})
endif()
