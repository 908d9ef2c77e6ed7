// SPDX-License-Identifier: Apache-2.0
#include "shared/version.h"

namespace Tools {

std::string versionOf(const std::string &name) {
  return name + " (poolctl) " POOLCTL_VERSION;
}

}  // namespace Tools
