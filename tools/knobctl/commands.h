// SPDX-License-Identifier: Apache-2.0
// knobctl's sub-commands: what each takes from the line, and the one call of the kernel that it
// makes.
#pragma once

#include <CLI/App.hpp>

#include "shared/tool.h"

namespace Knobctl {

// Adds every sub-command to APP. Parsing one puts what it does into *ACTION, which must live as
// long as APP.
void addCommands(CLI::App &app, Tools::Action *action);

}  // namespace Knobctl
