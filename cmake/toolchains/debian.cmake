# What the toolchain files of this folder share; each sets `triplet` and `processor` and includes
# this one. A firmware build copies both, and sets SYSROOT to its own.
if(NOT SYSROOT)
  set(SYSROOT "$ENV{SYSROOT}")
endif()
if(NOT SYSROOT)
  get_filename_component(SYSROOT "${CMAKE_CURRENT_LIST_DIR}/../../build/sysroot/${target}" ABSOLUTE)
endif()
set(SYSROOT "${SYSROOT}" CACHE PATH "The target's root folder, with headers and libraries")
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES SYSROOT)

set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_SYSTEM_PROCESSOR ${processor})
set(CMAKE_C_COMPILER ${triplet}-gcc)
set(CMAKE_CXX_COMPILER ${triplet}-g++)
set(CMAKE_LIBRARY_ARCHITECTURE ${multiarch})
set(CMAKE_SYSROOT ${SYSROOT})

set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_INCLUDE ONLY)
set(CMAKE_FIND_ROOT_PATH_MODE_PACKAGE ONLY)

# Of this machine's packages pkg-config is to see none.
set(ENV{PKG_CONFIG_PATH} "")
set(ENV{PKG_CONFIG_SYSROOT_DIR} ${SYSROOT})
set(ENV{PKG_CONFIG_LIBDIR}
    ${SYSROOT}/usr/lib/${multiarch}/pkgconfig:${SYSROOT}/usr/lib/pkgconfig:${SYSROOT}/usr/share/pkgconfig)

# Where time_t has 32 bits by default, the clock is to go on after 2038.
if(time32)
  add_compile_definitions(_TIME_BITS=64 _FILE_OFFSET_BITS=64)
endif()

# What runs the target's programs on this machine, in the tests only.
if(emulator)
  set(CMAKE_CROSSCOMPILING_EMULATOR ${emulator} -L ${SYSROOT})
elseif(loader)
  set(CMAKE_CROSSCOMPILING_EMULATOR ${SYSROOT}/lib/${loader}
      --library-path ${SYSROOT}/lib/${multiarch}:${SYSROOT}/usr/lib/${multiarch})
endif()
