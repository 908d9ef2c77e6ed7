# SPDX-License-Identifier: Apache-2.0
# Runs PROGRAM on an emulated kernel of its own, in FOLDER.
file(REMOVE_RECURSE ${FOLDER})
file(MAKE_DIRECTORY ${FOLDER})
file(WRITE ${FOLDER}/knob.conf "state = ${FOLDER}/kernel.db\n")
set(ENV{KNOB_CONF} ${FOLDER}/knob.conf)
execute_process(COMMAND ${PROGRAM} RESULT_VARIABLE result)
if(NOT result EQUAL 0)
  message(FATAL_ERROR "${PROGRAM}: ${result}")
endif()
