// SPDX-License-Identifier: Apache-2.0
// The tree of groups as a table: collected from the kernel, and laid out as text.
#pragma once

#include <string>
#include <vector>

#include "knob/kernel.h"

namespace Knobctl {

struct TreeRow {
  size_t depth = 0;
  Knob::GroupView group;
  size_t processes = 0;
};

// The group of that path and all below it: parents first, siblings by name. A group that goes away
// meanwhile is left out.
std::vector<TreeRow> collectTree(Knob::Kernel &kernel, const std::string &path);

enum class Look { kPlain, kColour };

// One line a group under one line of headings. Plain: no control bytes at all.
std::string layOutTree(const std::vector<TreeRow> &rows, const Knob::HostFacts &facts, Look look);

}  // namespace Knobctl
