# SPDX-License-Identifier: Apache-2.0
# What clang-format leaves open in C and C++: blank lines, braces, and where a file's own header is
# included. Prints "FILE:LINE: what is wrong" and fails when it printed anything.
# usage: awk -f layout.awk FILE...

function report(line, text) {
  print FILENAME ":" line ": " text
  found = 1
}

function indent(line) {
  match(line, /^ */)
  return RLENGTH
}

function closes_all(line, opening, closing) {
  opening = gsub(/\(/, "", line)
  closing = gsub(/\)/, "", line)
  return opening == closing
}

FNR == 1 {
  lines_after_control = -1
  previous = ""
  included = 0
  own_header = FILENAME
  sub(/\.(cpp|c)$/, ".h", own_header)
  if (own_header == FILENAME || (getline line < own_header) < 0) own_header = ""
  else close(own_header)
  sub(/.*\//, "", own_header)
}

/^#include/ && !included++ && own_header != "" && index($0, own_header "\"") == 0 {
  report(FNR, "the file's own header is to be included first")
}

# The line after a control statement without braces is its body; a deeper one belongs to it too.
lines_after_control >= 0 && ++lines_after_control == 2 {
  if ($0 !~ /^ *$/ && indent($0) > control_indent)
    report(control_line, "a body of several lines needs braces")
  lines_after_control = -1
}
lines_after_control != 1 && /^ *(} else )?(if|for|while) (constexpr )?\(.*\)$/ && closes_all($0) {
  lines_after_control = 0
  control_indent = indent($0)
  control_line = FNR
}

previous == "}" && /^[^}#]/ { report(FNR, "a blank line is missing before a definition") }
previous ~ /^ *$/ && FNR > 1 && /^ +}/ { report(FNR - 1, "a blank line before a closing brace") }

/[ \t]$/ { report(FNR, "blanks at the end of the line") }

{ previous = $0 }

END { exit found }
