// SPDX-License-Identifier: Apache-2.0
// A run of load or unload over all pools: done whole, or undone.
#pragma once

#include <functional>

#include "loader/definition_files.h"

namespace Commands {

struct Batch {
  // Works on one pool. Returns whether undo must include it. Throws Sched::Exception.
  std::function<bool(Loader::ResourcePoolImpl &pool)> work;

  // Reverses the work on one pool. Throws Sched::Exception.
  std::function<void(const Loader::ResourcePoolImpl &pool)> undo;

  // Before the name of the pool in the message when undo fails, such as "Failed to delete ".
  const char *undoFailed;
};

// Works on the pools in their order. After a Sched::Exception from the work, or a stop signal,
// calls undo for the pools that are done, newest first; then rethrows the exception or ends the
// process by the signal. A failing undo is reported and the next one is tried. A further signal
// ends the undo, and the pools that are left are reported.
void runBatch(const Loader::PoolList &pools, const Batch &batch);

}  // namespace Commands
