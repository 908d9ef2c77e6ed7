// SPDX-License-Identifier: Apache-2.0
// Why the yaml library cannot read a file, in terms of what people mistype.
#pragma once

#include <string>

#include "plan_check/finding.h"
#include "plan_check/source_file.h"

namespace Plan {

// The finding for the library's MESSAGE at PLACE. The finding may be at an earlier line, where the
// mistake is.
Finding syntaxFinding(const SourceFile &source, Place place, const std::string &message);

}  // namespace Plan
