// SPDX-License-Identifier: Apache-2.0
// Prints texts from outside for terminals and scripts, so that nothing in them ends a line, moves
// the cursor or breaks a table.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "common/printable.h"

namespace Tools {

using Platform::printable;

// How many columns a text takes on a terminal: one for each character, two for the wide ones of
// East Asia and for emoji, none for combining marks.
size_t displayWidth(std::string_view text);

// The text with blanks added up to that many columns.
std::string padded(const std::string &text, size_t columns);

}  // namespace Tools
