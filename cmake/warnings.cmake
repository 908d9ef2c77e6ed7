# SPDX-License-Identifier: Apache-2.0
add_compile_options(-Wall -Wextra -Wconversion -Wshadow)
add_compile_options($<$<COMPILE_LANGUAGE:CXX>:-Wnon-virtual-dtor>)
if(POOLCTL_WERROR)
  add_compile_options(-Wpedantic -Werror)
endif()
