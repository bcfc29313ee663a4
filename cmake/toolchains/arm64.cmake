# 64-bit ARM.
set(target arm64)
set(triplet aarch64-linux-gnu)
set(multiarch aarch64-linux-gnu)
set(processor aarch64)
set(time32 OFF)
set(emulator qemu-aarch64)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
