# SPDX-License-Identifier: Apache-2.0
# What compiler and linker do against memory errors and their abuse. tests/binaries looks at each
# built file for it.
include(CheckCXXCompilerFlag)
include(CheckCXXSourceCompiles)
include(CheckPIESupported)
check_pie_supported(LANGUAGES C CXX)

add_compile_options(-fstack-protector-strong)
add_link_options(-Wl,-z,relro,-z,now)
check_cxx_compiler_flag(-fcf-protection POOLCTL_HAS_CF_PROTECTION)  # x86 alone
if(POOLCTL_HAS_CF_PROTECTION)
  add_compile_options(-fcf-protection)
endif()

# Needs optimisation, and would hide what a sanitizer is there to find. Where the compiler or the C
# library lacks level 3, the headers warn.
if(NOT POOLCTL_SANITIZE AND NOT POOLCTL_COVERAGE AND NOT CMAKE_BUILD_TYPE STREQUAL "Debug")
  set(CMAKE_REQUIRED_FLAGS "-O2 -Werror -U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=3")
  check_cxx_source_compiles("#include <cstdio>\nint main() { return 0; }" POOLCTL_HAS_FORTIFY_3)
  unset(CMAKE_REQUIRED_FLAGS)
  if(POOLCTL_HAS_FORTIFY_3)
    set(level 3)
  else()
    set(level 2)
  endif()
  add_compile_options(-U_FORTIFY_SOURCE -D_FORTIFY_SOURCE=${level})
endif()
