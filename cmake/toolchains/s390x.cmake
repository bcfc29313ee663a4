# 64-bit and big-endian.
set(target s390x)
set(triplet s390x-linux-gnu)
set(multiarch s390x-linux-gnu)
set(processor s390x)
set(time32 OFF)
set(emulator qemu-s390x)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
