# SPDX-License-Identifier: BSD-2-Clause
# 32-bit ARM, with Debian's g++-arm-linux-gnueabihf and qemu-user-static.
set(CMAKE_SYSTEM_PROCESSOR armv7l)
set(machine arm-linux-gnueabihf)
set(emulator qemu-arm-static)
include(${CMAKE_CURRENT_LIST_DIR}/debian-cross.cmake)
# GCC would tell of each call that GCC 6 made differently.
string(APPEND CMAKE_CXX_FLAGS_INIT " -Wno-psabi")
