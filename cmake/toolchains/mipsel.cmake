# 32-bit MIPS, little-endian.
set(target mipsel)
set(triplet mipsel-linux-gnu)
set(multiarch mipsel-linux-gnu)
set(processor mipsel)
set(time32 ON)
set(emulator qemu-mipsel)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
