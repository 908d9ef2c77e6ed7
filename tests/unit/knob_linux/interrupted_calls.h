// SPDX-License-Identifier: Apache-2.0
// Lets a test act in the middle of an operation: just before this process's next write of an
// attribute or of a control file.
#pragma once

#include <functional>
#include <string>

namespace InterruptedCalls {

// Each is called once, before the call it waits for is made; empty: nothing waits.
void beforeNextAttribute(std::function<void()> act);
void beforeNextWrite(std::function<void()> act);

// Is called before every write of a control file, until it is set to nothing.
void beforeEveryWrite(std::function<void()> act);

}  // namespace InterruptedCalls
