# SPDX-License-Identifier: Apache-2.0
# Writes OUTPUT with the md5 of the interface: the declarations of the public headers in HEADERS (a
# folder), statuses and records included, and the names and numbers of the nodes in NODES. Comments
# and blanks are left out, so that they can change without a mismatch on hosts that are in use.
function(read_declarations file result)
  file(READ "${file}" text)
  string(REGEX REPLACE "/[*]([^*]|[*]+[^*/])*[*]+/" " " text "${text}")
  string(REGEX REPLACE "//[^\n]*" " " text "${text}")
  string(REGEX REPLACE "[\\ \t\r\n]+" " " text "${text}")
  string(REGEX REPLACE " ?([^A-Za-z0-9_ ]) ?" "\\1" text "${text}")
  string(STRIP "${text}" text)
  set(${result} "${text}" PARENT_SCOPE)
endfunction()

set(interface "")
foreach(header knob.h knob_status.h knob_records.h)
  read_declarations("${HEADERS}/${header}" declarations)
  string(APPEND interface "${declarations}\n")
endforeach()

read_declarations("${NODES}" list)
string(REGEX MATCHALL "row\\([a-zA-Z0-9_]+,0x[0-9a-fA-F]+" nodes "${list}")
if(NOT nodes)
  message(FATAL_ERROR "${NODES}: no node found")
endif()
string(APPEND interface "${nodes}")

string(MD5 sum "${interface}")
file(WRITE "${OUTPUT}"
  "// The md5 of the interface; made by the build.\n#pragma once\n\ninline constexpr const char *kInterfaceMd5 = \"${sum}\";\n")
