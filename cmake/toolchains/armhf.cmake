# 32-bit ARM with hardware floating point.
set(target armhf)
set(triplet arm-linux-gnueabihf)
set(multiarch arm-linux-gnueabihf)
set(processor armv7l)
set(time32 ON)
set(emulator qemu-arm)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
