// SPDX-License-Identifier: Apache-2.0
// kestrelctl's sub-commands: what each takes from the line, and the one call of the store that it
// makes.
#pragma once

#include <CLI/App.hpp>

#include "shared/tool.h"

namespace Kestrelctl {

// Adds every sub-command to APP. Parsing one puts what it does into *ACTION, which must live as
// long as APP.
void addCommands(CLI::App &app, Tools::Action *action);

}  // namespace Kestrelctl
