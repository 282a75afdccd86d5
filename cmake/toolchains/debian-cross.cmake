# SPDX-License-Identifier: BSD-2-Clause
# Shared by the toolchains of Debian's cross compilers, which set:
#   machine   the compilers' prefix, and the folder of that machine's libraries (multiarch tuple)
#   emulator  the program that runs its programs here
set(CMAKE_SYSTEM_NAME Linux)
set(CMAKE_C_COMPILER ${machine}-gcc)
set(CMAKE_CXX_COMPILER ${machine}-g++)
set(CMAKE_LIBRARY_ARCHITECTURE ${machine})
set(CMAKE_CROSSCOMPILING_EMULATOR ${emulator};-L;/usr/${machine})

# Libraries that the compiler does not bring lie in a folder of their own; see script/test-arm.
# Only headers that are the same on every machine come from this one.
set(OTRP_SYSROOT "" CACHE PATH "Folder with the libraries of ${machine}, as packages unpack")
list(APPEND CMAKE_TRY_COMPILE_PLATFORM_VARIABLES OTRP_SYSROOT)
if(OTRP_SYSROOT)
  set(CMAKE_FIND_ROOT_PATH ${OTRP_SYSROOT})
  set(CMAKE_FIND_ROOT_PATH_MODE_LIBRARY ONLY)
  set(CMAKE_FIND_ROOT_PATH_MODE_PROGRAM NEVER)
  set(ENV{PKG_CONFIG_LIBDIR} ${OTRP_SYSROOT}/usr/lib/${machine}/pkgconfig)
  set(ENV{PKG_CONFIG_SYSROOT_DIR} ${OTRP_SYSROOT})
  set(CMAKE_C_FLAGS_INIT "-isystem ${OTRP_SYSROOT}/usr/include/${machine}")
  set(CMAKE_CXX_FLAGS_INIT "${CMAKE_C_FLAGS_INIT}")
  # What the libraries of a program need is found there, too, by the linker and when it runs; a
  # program that is built as it is installed has no path there of its own.
  set(CMAKE_EXE_LINKER_FLAGS_INIT "-Wl,-rpath-link,${OTRP_SYSROOT}/usr/lib/${machine}")
  list(APPEND CMAKE_CROSSCOMPILING_EMULATOR
    -E LD_LIBRARY_PATH=${OTRP_SYSROOT}/usr/lib/${machine})
endif()
