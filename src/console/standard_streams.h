// SPDX-License-Identifier: Apache-2.0
// The three descriptors that a program starts with.
#pragma once

namespace Console {

// Opens /dev/null for each standard descriptor that is closed, before any other file can get its
// number and with it the program's messages. Reading standard input, or writing to the other two,
// still fails as it does on a closed descriptor. Ends the process with status 1 if /dev/null cannot
// be opened.
void occupyClosedStreams() noexcept;

}  // namespace Console
