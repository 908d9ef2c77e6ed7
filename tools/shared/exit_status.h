// SPDX-License-Identifier: Apache-2.0
// The exit statuses of all tools. Scripts test them, so no number may change its meaning.
#pragma once

namespace Tools {

enum ExitStatus {
  kExitSuccess = 0,
  kExitFailure = 1,   // it was tried and failed
  kExitUsage = 2,     // the command line is wrong; nothing was tried
  kExitNotFound = 3,  // something that the command line names does not exist
  kExitBusy = 4,      // it exists and is in use
};

}  // namespace Tools
