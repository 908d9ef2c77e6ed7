// SPDX-License-Identifier: Apache-2.0
// The facts of the host that expressions may use.
#pragma once

#include "calc/variable_table.h"

namespace Loader {

// Read from the kernel on the first call and kept until exit. Throws Loader::Exception with a
// null mark when the kernel does not answer; the next call then asks for what is still missing.
const Calc::VariableTable &hostFacts();

}  // namespace Loader
