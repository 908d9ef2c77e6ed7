// SPDX-License-Identifier: Apache-2.0
// Goes as far as it gets, from the configuration over the state to the signature; the first thing
// that is wrong is the problem.
#include "knobctl/condition.h"

#include <filesystem>

#include "knob/emulated/emulated_kernel.h"
#include "knob/linux/linux_kernel.h"
#include "knob/session.h"
#include "knob/signature.h"

namespace Knobctl {

namespace {

using Kind = Knob::Configuration::KernelKind;

std::string signatureText(const Knob::BuildSignature &signature) {
  return signature.md5 + ", built " + signature.buildDate;
}

// What is missing on this host. Another build of the library is nothing that is: groups outlive an
// upgrade, and only another interface cannot work on them.
bool describeHost(const Knob::Configuration &configuration, Condition *condition) {
  const Knob::LinuxHost host = Knob::lookAtLinuxHost(configuration);
  condition->lines.emplace_back(
      "groups",
      host.path + "/host" + (host.hasGroups ? "" : " (none yet; the first use makes it)"));
  for (const auto &[name, text] : host.account) condition->lines.emplace_back(name, text);
  for (const std::string &problem : host.problems) {
    condition->problem += (condition->problem.empty() ? "" : "; ") + problem;
  }
  return host.hasGroups;
}

// true when there is something to open.
bool describeState(const Knob::Configuration &configuration, Condition *condition) {
  if (configuration.kernel == Kind::kLinux) return describeHost(configuration, condition);
  const std::string path = Knob::emulatedStatePath(configuration);
  std::error_code unknown;  // opening it will say what is wrong
  const bool missing = !std::filesystem::exists(path, unknown) && !unknown;
  condition->lines.emplace_back("state",
                                missing ? path + " (none yet; the first use makes it)" : path);
  return !missing;
}

void describeSignatures(const Knob::Configuration &configuration, Condition *condition) {
  const auto kernel = Knob::openKernel(configuration);
  const Knob::BuildSignature running = kernel->signature();
  const Knob::BuildSignature own = Knob::buildSignature();
  condition->lines.emplace_back("kernel's signature", signatureText(running));
  if (configuration.kernel == Kind::kLinux) {
    if (running.md5 == own.md5) return;
    condition->problem =
        "the groups were made with a libknob of another interface; unload the pools with that "
        "version, take the groups over with knobctl check --repair, or restart the machine";
    return;
  }
  if (running.md5 == own.md5 && running.buildDate == own.buildDate) return;
  condition->problem = "the kernel was started by another build of libknob; boot it anew";
}

void look(Condition *condition) {
  const Knob::Configuration configuration = Knob::sessionConfiguration();
  const std::string &source = configuration.source;
  condition->lines = {
      {"configuration", source.empty() ? "no file; the defaults hold" : source},
      {"kernel", configuration.kernel == Kind::kEmulated ? "emulated" : "linux"},
      {"library's signature", signatureText(Knob::buildSignature())},
  };
  if (describeState(configuration, condition)) describeSignatures(configuration, condition);
}

}  // namespace

Condition lookAtKernel() {
  Condition condition;
  try {
    look(&condition);
  } catch (const Knob::KernelError &error) {
    condition.problem = std::string("kernel not usable: ") + error.what();
  }
  if (condition.problem.empty()) condition.lines.emplace_back("condition", "usable");
  return condition;
}

}  // namespace Knobctl
