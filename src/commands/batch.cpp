// SPDX-License-Identifier: Apache-2.0
#include "commands/batch.h"

#include "commands/stop_signals.h"
#include "console/message.h"
#include "sched/exception.h"

namespace Commands {
namespace {

void undoPool(const Loader::ResourcePoolImpl &pool, const Batch &batch) {
  try {
    batch.undo(pool);
  } catch (const Sched::Exception &failure) {
    Console::printError(batch.undoFailed, pool.name, ": ", failure.what());
  }
}

void undoAll(const Loader::PoolList &done, const Batch &batch, StopSignals &signals) {
  bool ended = false;
  for (auto pool = done.rbegin(); pool != done.rend(); ++pool) {
    const bool isSecond = signals.first() != 0;
    if (signals.poll() && isSecond) ended = true;
    if (ended) {
      Console::printError((*pool)->name, ": not undone");
    } else {
      undoPool(**pool, batch);
    }
  }
}

}  // namespace

void runBatch(const Loader::PoolList &pools, const Batch &batch) {
  StopSignals signals;
  Loader::PoolList done;
  done.reserve(pools.size());  // no memory is needed between a pool's work and its entry
  for (const auto &pool : pools) {
    try {
      if (batch.work(*pool)) done.push_back(pool);
    } catch (const Sched::Exception &failure) {
      undoAll(done, batch, signals);
      if (signals.first() == 0) throw;
      Console::printError(failure.what());
      signals.endProcess();
    }
    if (signals.poll()) {
      undoAll(done, batch, signals);
      signals.endProcess();
    }
  }
}

}  // namespace Commands
