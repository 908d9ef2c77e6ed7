// SPDX-License-Identifier: Apache-2.0
// One table from a kernel's status to a tool's exit status.
#include "knobctl/kernel_access.h"

#include "knob/status.h"
#include "shared/text.h"

namespace Knobctl {

namespace {

Tools::ExitStatus exitStatus(Knob::Status status) {
  switch (status) {
    case Knob::Status::kNotFound:
      return Tools::kExitNotFound;
    case Knob::Status::kBusy:
    case Knob::Status::kMemoryBusy:
      return Tools::kExitBusy;
    default:
      return Tools::kExitFailure;
  }
}

bool endsWith(const std::string &text, const std::string &end) {
  return text.size() >= end.size() && text.compare(text.size() - end.size(), end.size(), end) == 0;
}

// What went wrong, without a reason that WHAT has said: "stats host/a: not found" needs no second
// host/a.
std::string explained(const std::string &what, const Knob::KernelError &error) {
  const auto status = static_cast<uint32_t>(error.status);
  const std::string reason = error.what();
  if (reason.empty()) return Knob::statusText(status);
  // The status's name refers people to knobctl, which this is.
  const std::string name = error.status == Knob::Status::kKernelNotUsable
                               ? "kernel not usable"
                               : std::string(Knob::statusName(status));
  return endsWith(what, reason) ? name : name + ": " + Tools::printable(reason);
}

}  // namespace

Tools::Failure failure(const std::string &what, const Knob::KernelError &error) {
  return {exitStatus(error.status), Tools::printable(what) + ": " + explained(what, error)};
}

}  // namespace Knobctl
