# SPDX-License-Identifier: BSD-2-Clause
# Release builds are hardened as Debian's packages are, and give the same bytes in every folder.
add_compile_options(
  -fstack-protector-strong -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=2 -Wformat -Werror=format-security
  -ffile-prefix-map=${CMAKE_BINARY_DIR}=build -ffile-prefix-map=${PROJECT_SOURCE_DIR}=.)
add_link_options(-Wl,-z,relro -Wl,-z,now)

include(CheckPIESupported)
check_pie_supported(LANGUAGES C CXX)
