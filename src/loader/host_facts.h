// SPDX-License-Identifier: Apache-2.0
// The facts of the host that expressions can use.
#pragma once

#include "calc/variable_table.h"

namespace Loader {

// Read from the kernel on the first call and kept until exit. Throws Loader::Exception with a null
// mark if a record cannot be read; the next call then reads the records that are still missing.
const Calc::VariableTable &hostFacts();

}  // namespace Loader
