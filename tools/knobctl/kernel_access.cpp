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

// The status's own text refers people to knobctl; here the reason follows.
std::string statusWords(Knob::Status status) {
  if (status == Knob::Status::kKernelNotUsable) return "kernel not usable";
  return Knob::statusText(static_cast<uint32_t>(status));
}

bool endsWith(const std::string &text, const std::string &end) {
  return text.size() >= end.size() &&
         text.compare(text.size() - end.size(), end.size(), end) == 0;
}

}  // namespace

Tools::Failure failure(const std::string &what, const Knob::KernelError &error) {
  std::string text = Tools::printable(what) + ": " + statusWords(error.status);
  const std::string reason = error.what();
  const bool isNamed = endsWith(what, reason);  // "stats host/a: not found" needs no second host/a
  if (!isNamed) text += ": " + Tools::printable(reason);
  return {exitStatus(error.status), text};
}

}  // namespace Knobctl
