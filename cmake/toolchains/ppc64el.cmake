# 64-bit POWER, little-endian.
set(target ppc64el)
set(triplet powerpc64le-linux-gnu)
set(multiarch powerpc64le-linux-gnu)
set(processor ppc64le)
set(time32 OFF)
set(emulator qemu-ppc64le)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
