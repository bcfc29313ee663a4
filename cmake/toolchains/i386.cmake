# 32-bit x86; an x86-64 kernel runs it without an emulator.
set(target i386)
set(triplet i686-linux-gnu)
set(multiarch i386-linux-gnu)
set(processor i686)
set(time32 ON)
set(loader ld-linux.so.2)
include(${CMAKE_CURRENT_LIST_DIR}/debian.cmake)
