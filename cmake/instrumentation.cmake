# SPDX-License-Identifier: Apache-2.0
if(POOLCTL_SANITIZE)
  add_compile_options(-fsanitize=${POOLCTL_SANITIZE} -fno-sanitize-recover=all -fno-omit-frame-pointer)
  add_link_options(-fsanitize=${POOLCTL_SANITIZE})
endif()
if(POOLCTL_COVERAGE)
  add_compile_options(--coverage -fprofile-update=atomic)
  add_link_options(--coverage)
endif()
if(POOLCTL_FUZZ)
  # Lets the fuzzer see which code each input reaches.
  add_compile_options(-fsanitize=fuzzer-no-link)
endif()
