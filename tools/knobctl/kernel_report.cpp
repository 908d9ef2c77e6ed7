// SPDX-License-Identifier: Apache-2.0
// Looks at the configuration, then at the kernel's state, then at the signatures. The first thing
// that is wrong is the problem.
#include "knobctl/kernel_report.h"

#include <filesystem>

#include "knob/emulated/state_file.h"
#include "knob/linux/linux_kernel.h"
#include "knob/session.h"
#include "knob/signature.h"

namespace Knobctl {

namespace {

using Kind = Knob::Configuration::KernelKind;

std::string signatureText(const Knob::BuildSignature &signature) {
  return signature.md5 + ", built " + signature.buildDate;
}

// Adds what is missing on this host. Returns whether there are groups.
bool describeHost(const Knob::Configuration &configuration, KernelReport *report) {
  const Knob::LinuxHost host = Knob::lookAtLinuxHost(configuration);
  report->lines.emplace_back(
      "groups",
      host.path + "/host" + (host.hasGroups ? "" : " (none yet; the first use makes it)"));
  for (const auto &[name, text] : host.account) report->lines.emplace_back(name, text);
  for (const std::string &problem : host.problems) {
    report->problem += (report->problem.empty() ? "" : "; ") + problem;
  }
  return host.hasGroups;
}

// Returns whether there is a state to open.
bool describeState(const Knob::Configuration &configuration, KernelReport *report) {
  if (configuration.kernel == Kind::kLinux) return describeHost(configuration, report);
  const std::string path = Knob::emulatedStatePath(configuration);
  std::error_code unknown;  // opening the state reports what is wrong
  const bool missing = !std::filesystem::exists(path, unknown) && !unknown;
  report->lines.emplace_back("state",
                             missing ? path + " (none yet; the first use makes it)" : path);
  return !missing;
}

void describeSignatures(const Knob::Configuration &configuration, KernelReport *report) {
  const Knob::BuildSignature running = Knob::openKernel(configuration)->signature();
  report->lines.emplace_back("kernel's signature", signatureText(running));
  if (Knob::sameInterface(running, Knob::buildSignature())) return;
  report->problem = configuration.kernel == Kind::kLinux
                        ? "the groups were made with a libknob of another interface; unload the "
                          "pools with that version, take the groups over with knobctl check "
                          "--repair, or restart the machine"
                        : "the kernel was started by a libknob of another interface; unload the "
                          "pools with that version, or restart the kernel without its groups with "
                          "knobctl boot --force";
}

void look(KernelReport *report) {
  const Knob::Configuration configuration = Knob::sessionConfiguration();
  const std::string &source = configuration.source;
  report->lines = {
      {"configuration", source.empty() ? "no file; the defaults are used" : source},
      {"kernel", configuration.kernel == Kind::kEmulated ? "emulated" : "linux"},
      {"library's signature", signatureText(Knob::buildSignature())},
  };
  if (describeState(configuration, report)) describeSignatures(configuration, report);
}

}  // namespace

KernelReport reportOnKernel() {
  KernelReport report;
  try {
    look(&report);
  } catch (const Knob::KernelError &error) {
    report.problem = std::string("kernel not usable: ") + error.what();
  }
  if (report.problem.empty()) report.lines.emplace_back("condition", "usable");
  return report;
}

}  // namespace Knobctl
