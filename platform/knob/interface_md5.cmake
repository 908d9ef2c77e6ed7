# SPDX-License-Identifier: Apache-2.0
# Writes OUTPUT with the md5 of the interface header HEADER.
file(MD5 "${HEADER}" sum)
file(WRITE "${OUTPUT}"
  "// The md5 of knob.h; made by the build.\n#pragma once\n\ninline constexpr const char *kInterfaceMd5 = \"${sum}\";\n")
