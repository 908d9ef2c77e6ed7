// SPDX-License-Identifier: Apache-2.0
// The facts of the host that expressions can use.
#pragma once

#include <stdexcept>

#include "calc/variable_table.h"

namespace Loader {

// Nested in the exception of hostFacts() if the kernel as a whole is not usable, for example
// because of its configuration. what(): the kernel's text for that.
class KernelNotUsable : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Read from the kernel on the first call and kept until exit. Throws Loader::Exception with a null
// mark if a record cannot be read; the next call then reads the records that are still missing.
const Calc::VariableTable &hostFacts();

}  // namespace Loader
