# SPDX-License-Identifier: Apache-2.0
# Tests that need a Linux kernel of their own: uml-run boots one for the program.

# The sanitizers' shadow memory needs more room than user-mode Linux gives a process. A test that
# cannot run for that says so.
if(POOLCTL_SANITIZE MATCHES "address|thread")
  set(machine_skip sh -c "echo 'SKIPPED: no machine holds the shadow memory of this sanitizer'; exit 77")
endif()

# label: the test is machine.LABEL. mem: the machine's memory. limit: seconds after which it is lost.
function(add_machine_test label program mem limit)
  set(run ${CMAKE_SOURCE_DIR}/tests/uml/uml-run --mem=${mem} --limit=${limit})
  if(POOLCTL_COVERAGE)
    list(APPEND run --writable=${CMAKE_BINARY_DIR})
  endif()
  if(machine_skip)
    set(run ${machine_skip})
  endif()
  math(EXPR timeout "${limit} + 30")
  add_test(NAME machine.${label} COMMAND ${run} -- $<TARGET_FILE:${program}>)
  set_tests_properties(machine.${label} PROPERTIES SKIP_RETURN_CODE 77 LABELS machine
                       TIMEOUT ${timeout})
endfunction()
