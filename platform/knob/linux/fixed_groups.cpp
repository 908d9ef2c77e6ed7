// SPDX-License-Identifier: Apache-2.0
// A package is upgraded while groups exist: the note keeps the first library's date, and what is
// compared is the interface alone. So only an upgrade that changes the interface is a mismatch, and
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

[[noreturn]] void notUsable(const Groups &groups, const KernelError &error) {
  std::string mend;
  if (error.status == Status::kPermissionDenied) {
    mend = kMendRights;
  } else if (error.status == Status::kBusy) {
    mend = "; processes live in " + groups.hierarchy().path +
           " itself: move them to a group below it, or let cgroup-root name another";
  }
  throw KernelError(Status::kKernelNotUsable, std::string(error.what()) + mend);
}

// Somebody else may be making the same group at this moment.
GroupPtr makeIfMissing(Groups &groups, Group *parent, const std::string &path) {
  if (GroupPtr group = groups.lookUp(path)) return group;
  try {
    if (parent == nullptr) return groups.makeHost();
    groups.passOn(*parent);
    return groups.make(*parent, kFixedChildName);
  } catch (const KernelError &error) {
    if (error.status != Status::kExists) throw;
  }
  return groups.lookUp(path);
}

// Whether there is nothing in the tree but the two.
bool isUntouched(Groups &groups, const Group &host) {
  for (const Child &child : groups.children(host)) {
    if (child.name != kFixedChildName) return false;
    const GroupPtr opt = groups.lookUp(optPath());
    if (opt && groups.hasChildren(*opt)) return false;
  }
  return true;
}

}  // namespace

void makeFixedGroups(Groups &groups) {
  try {
    const GroupPtr host = makeIfMissing(groups, nullptr, std::string(kRootName));
    if (!host) return;
    if (!readAttribute(host->directory, kLibraryAttribute)) writeSignature(*host);
    (void)makeIfMissing(groups, host.get(), optPath());
  } catch (const KernelError &error) {
    notUsable(groups, error);
  }
}

BuildSignature readSignature(Groups &groups) {
  BuildSignature own = buildSignature();
  const GroupPtr host = groups.lookUp(kRootName);
  if (!host) return own;
  const auto text = readAttribute(host->directory, kLibraryAttribute);
  const auto noted = text ? parseSignature(*text) : std::nullopt;
  if (!noted) return own;
  if (noted->md5 == own.md5 || !isUntouched(groups, *host)) return *noted;
  try {
    writeSignature(*host);
  } catch (const KernelError &) {
    // Without the right to write, the note stays for one who has it.
  }
  return own;
}

void writeSignature(const Group &host) {
  writeAttribute(host.directory, kLibraryAttribute, signatureText(buildSignature()));
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
