// SPDX-License-Identifier: Apache-2.0
// A package is upgraded while groups exist: the attribute keeps the first library's build date, and
// only the interface is compared. So only an upgrade that changes the interface is a mismatch, and
// only as long as groups of the older one remain.
#include "knob/linux/fixed_groups.h"

#include "knob/linux/cgroup_files.h"
#include "knob/linux/record.h"
#include "knob/names.h"
#include "knob/signature.h"

namespace Knob::Linux {
namespace {

constexpr size_t kMd5Digits = 32;

std::string optPath() {
  return std::string(kRootName) + "/" + std::string(kFixedChildName);
}

[[noreturn]] void notUsable(const CgroupTree &tree, const KernelError &error) {
  std::string whatToDo;
  if (error.status == Status::kPermissionDenied) {
    whatToDo = kHowToGetRights;
  } else if (error.status == Status::kBusy) {
    whatToDo = "; processes are in " + tree.hierarchy().path +
               " itself: move them to a group below it, or set cgroup-root to another group";
  }
  throw KernelError(Status::kKernelNotUsable, std::string(error.what()) + whatToDo);
}

// Another process may be making the same group at this moment.
GroupPtr makeIfMissing(CgroupTree &tree, Group *parent, const std::string &path) {
  if (GroupPtr group = tree.lookUp(path)) return group;
  try {
    const GroupPtr group =
        parent == nullptr ? tree.makeHost() : tree.make(*parent, kFixedChildName);
    writeFirstRecord(group->fd());
    return group;
  } catch (const KernelError &error) {
    if (error.status != Status::kExists) throw;
  }
  return tree.lookUp(path);
}

// Whether the two fixed groups are the only ones.
bool isUntouched(CgroupTree &tree, const Group &host) {
  for (const Child &child : readChildren(host.fd())) {
    if (child.name != kFixedChildName) return false;
    const GroupPtr opt = tree.lookUp(optPath());
    if (opt && tree.hasChildren(*opt)) return false;
  }
  return true;
}

}  // namespace

bool isFixedGroup(CgroupTree &tree, Group &group) {
  const GroupPtr parent = tree.parentOf(group);
  return !parent || (!tree.parentOf(*parent) && tree.nameOf(group) == kFixedChildName);
}

void makeFixedGroups(CgroupTree &tree) {
  try {
    const GroupPtr host = makeIfMissing(tree, nullptr, std::string(kRootName));
    if (!host) return;
    if (!readAttribute(host->fd(), kLibraryAttribute)) writeSignature(*host);
    (void)makeIfMissing(tree, host.get(), optPath());
  } catch (const KernelError &error) {
    notUsable(tree, error);
  }
}

BuildSignature readSignature(CgroupTree &tree) {
  BuildSignature own = buildSignature();
  const GroupPtr host = tree.lookUp(kRootName);
  if (!host) return own;
  const auto text = readAttribute(host->fd(), kLibraryAttribute);
  const auto stored = text ? parseSignature(*text) : std::nullopt;
  if (!stored) return own;
  if (stored->md5 == own.md5 || !isUntouched(tree, *host)) return *stored;
  try {
    writeSignature(*host);
  } catch (const KernelError &) {
    // A process without the right to write leaves it to one that has it.
  }
  return own;
}

void writeSignature(const Group &host) {
  writeAttribute(host.fd(), kLibraryAttribute, signatureText(buildSignature()));
}

std::string signatureText(const BuildSignature &signature) {
  return signature.md5 + " " + signature.buildDate;
}

std::optional<BuildSignature> parseSignature(std::string_view text) {
  const size_t blank = text.find(' ');
  if (blank != kMd5Digits || blank + 1 == text.size()) return std::nullopt;
  return BuildSignature{std::string(text.substr(0, blank)), std::string(text.substr(blank + 1))};
}

}  // namespace Knob::Linux
