// SPDX-License-Identifier: Apache-2.0
// No step kills a process: the kernel refuses a maximum that living processes exceed.
#include "poolctl_plan/execution.h"

#include <optional>
#include <thread>
#include <utility>

#include "knob/status.h"
#include "plan_check/pool_tree.h"

namespace Plan {
namespace {

using Act = Step::Act;
using Knob::KernelError;
using Knob::Resource;
using Knob::Status;

constexpr std::chrono::milliseconds kPause{100};

bool mayPass(Status status) {
  switch (status) {
    case Status::kBusy:
    case Status::kMemoryBusy:
    case Status::kReservationRefused:
    case Status::kNotFound:
    case Status::kOutOfMemory:
      return true;
    default:
      return false;
  }
}

std::string reasonOf(const KernelError &error) {
  const std::string status = Knob::statusText(static_cast<uint32_t>(error.status));
  const std::string detail = error.what();
  return detail.empty() ? status : status + ": " + detail;
}

void create(const Step &step, Knob::Kernel &kernel) {
  const std::string name = step.path.substr(step.path.rfind('/') + 1);
  const Knob::GroupId id = kernel.create(kernel.lookUp(parentOf(step.path)), name);
  try {
    kernel.setAllocation(id, Resource::kMemory, step.memory);
    kernel.setAllocation(id, Resource::kCpu, step.cpu);
  } catch (const KernelError &) {
    kernel.remove(id);
    throw;
  }
}

void make(const Step &step, Knob::Kernel &kernel) {
  switch (step.act) {
    case Act::kDelete:
      kernel.remove(kernel.lookUp(step.path));
      break;
    case Act::kCreate:
      create(step, kernel);
      break;
    case Act::kSet:
      kernel.setAllocation(kernel.lookUp(step.path), step.resource,
                           step.resource == Resource::kMemory ? step.memory : step.cpu);
      break;
  }
}

// Tries the step. Returns whether it is decided: done, or failed for good.
bool attempt(Outcome *outcome, Knob::Kernel &kernel) {
  try {
    make(outcome->step, kernel);
    outcome->isDone = true;
    outcome->reason.clear();
    return true;
  } catch (const KernelError &error) {
    outcome->reason = reasonOf(error);
    return !mayPass(error.status);
  }
}

}  // namespace

std::vector<Outcome> execute(const std::vector<Step> &steps, Knob::Kernel &kernel,
                             std::chrono::seconds wait,
                             const std::function<void(const Outcome &)> &report) {
  const auto deadline = std::chrono::steady_clock::now() + wait;
  std::vector<Outcome> outcomes;
  for (const Step &step : steps) outcomes.push_back({step, false, ""});
  std::vector<Outcome *> pending;
  for (Outcome &outcome : outcomes) pending.push_back(&outcome);
  while (!pending.empty()) {
    std::vector<Outcome *> left;
    bool progress = false;
    for (Outcome *const outcome : pending) {
      if (attempt(outcome, kernel)) {
        progress = progress || outcome->isDone;
        report(*outcome);
      } else {
        left.push_back(outcome);
      }
    }
    pending = std::move(left);
    if (pending.empty() || progress) continue;
    if (std::chrono::steady_clock::now() >= deadline) break;
    std::this_thread::sleep_for(kPause);
  }
  for (const Outcome *const outcome : pending) report(*outcome);
  return outcomes;
}

}  // namespace Plan
