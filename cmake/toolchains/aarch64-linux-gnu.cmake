# SPDX-License-Identifier: BSD-2-Clause
# 64-bit ARM, with Debian's g++-aarch64-linux-gnu and qemu-user-static.
set(CMAKE_SYSTEM_PROCESSOR aarch64)
set(machine aarch64-linux-gnu)
set(emulator qemu-aarch64-static)
include(${CMAKE_CURRENT_LIST_DIR}/debian-cross.cmake)
