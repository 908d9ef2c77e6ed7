// SPDX-License-Identifier: Apache-2.0
// Opens the Linux kernel of this machine, and looks at it from outside.
#include "knob/linux/linux_kernel.h"

#include <fcntl.h>
#include <unistd.h>

#include "knob/linux/check.h"
#include "knob/linux/fixed_groups.h"
#include "knob/linux/hierarchy.h"
#include "knob/linux/kernel_on_groups.h"

namespace Knob {
namespace {

bool mayWrite(int directory, const char *name) {
  return ::faccessat(directory, name, W_OK, AT_EACCESS) == 0;
}

// A group's files can belong to somebody else than its directory.
bool mayMakeGroupsIn(int directory) {
  return mayWrite(directory, ".") && mayWrite(directory, Linux::kSubtreeFile);
}

// Whatever goes wrong before there is a kernel means that there is none.
template <typename F>
auto beforeUse(const F &f) {
  try {
    return f();
  } catch (const KernelError &error) {
    throw KernelError(Status::kKernelNotUsable, error.what());
  }
}

LinuxHost lookAt(const Configuration &configuration) {
  Linux::Groups groups(Linux::openHierarchy(configuration));
  LinuxHost host;
  host.path = groups.hierarchy().path;
  const Linux::GroupPtr group = groups.host();
  host.hasGroups = group != nullptr;

  if (!mayMakeGroupsIn(group ? group->directory : groups.hierarchy().directory.get())) {
    host.problems.push_back("no right to make or change groups in " + host.path +
                            Linux::kMendRights);
  }
  if (!group) return host;
  HostFacts unused;
  const Linux::Held held = Linux::Bookkeeper(groups, unused).read(*group);
  const ResourceState &memory = held.record.memory;
  const int64_t promised = reservationOf(memory);
  for (std::string &text : Linux::unprotectedAbove(groups, promised)) {
    host.problems.push_back(std::move(text));
  }
  return host;
}

}  // namespace

std::unique_ptr<Kernel> openLinuxKernel(const Configuration &configuration) {
  return beforeUse([&] {
    return std::make_unique<Linux::KernelOnGroups>(Linux::openHierarchy(configuration),
                                                   configuration.maxVms);
  });
}

LinuxHost lookAtLinuxHost(const Configuration &configuration) {
  return beforeUse([&] { return lookAt(configuration); });
}

}  // namespace Knob
