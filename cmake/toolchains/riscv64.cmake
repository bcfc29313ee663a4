# 64-bit RISC-V.
set(target riscv64)
set(triplet riscv64-linux-gnu)
set(multiarch riscv64-linux-gnu)
set(processor riscv64)
set(time32 OFF)
set(emulator qemu-riscv64)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
