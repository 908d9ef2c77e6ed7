// SPDX-License-Identifier: Apache-2.0
// Lets a test act in the middle of an operation: just before this process's next write of an
// attribute or of a control file. Or fails such a write.
#pragma once

#include <functional>
#include <string>

namespace InterruptedCalls {

// Each is called once, before the call it waits for is made; empty: nothing waits.
void beforeNextAttribute(std::function<void()> act);
void beforeNextWrite(std::function<void()> act);

// Is called before every write of a control file, until it is set to nothing.
void beforeEveryWrite(std::function<void()> act);

// Lets the nth write of a control file from now on fail with EIO; 0: none.
void failWrite(int nth);

}  // namespace InterruptedCalls
