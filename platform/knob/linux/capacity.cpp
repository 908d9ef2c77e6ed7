// SPDX-License-Identifier: Apache-2.0
// Of memory these are huge pages, and what other programs have protected with memory.min beside
// host or beside a group above it.
#include "knob/linux/capacity.h"

#include <fcntl.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <system_error>

#include "common/read_file.h"
#include "common/unique_fd.h"
#include "knob/admission.h"
#include "knob/linux/cgroup_files.h"
#include "knob/linux/control_values.h"
#include "knob/names.h"

namespace Knob::Linux {
namespace {

using Platform::UniqueFd;

constexpr const char *kMemInfoFile = "/proc/meminfo";
constexpr size_t kMaxMemInfoBytes = size_t{64} * 1024;
constexpr int64_t kDefaultPercent = 5;
constexpr int64_t kMinMemoryMB = 64;
constexpr std::chrono::seconds kMaxAge{1};

int64_t reserveFor(Resource resource, int64_t total, const Reserve &reserve) {
  const int64_t part = (total * kDefaultPercent + 99) / 100;
  if (resource == Resource::kCpu) return reserve.cpuPercent.value_or(part);
  return reserve.memoryMB.value_or(std::max(part, kMinMemoryMB));
}

std::string memInfo() {
  try {
    return Platform::readFile(kMemInfoFile, kMaxMemInfoBytes);
  } catch (const std::system_error &error) {
    fail(error.code().value(), std::string("cannot read ") + kMemInfoFile);
  }
}

// Adds the groups in a directory that have a memory.min, but for one.
void addMinimums(int directory, const std::string &path, const std::string &except,
                 std::vector<Holder> &holders) {
  for (const auto &[id, name] : readChildren(directory)) {
    if (name == except) continue;
    const auto text = readControlIfAny(directory, (name + "/memory.min").c_str());
    const int64_t minMB = minimumMegabytes(text ? parseLimit(*text).value_or(0) : 0);
    if (minMB > 0) holders.push_back({path + "/" + name, minMB});
  }
}

void addForeignMinimums(const Hierarchy &hierarchy, std::vector<Holder> &holders) {
  UniqueFd directory(::openat(hierarchy.directory.get(), ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  std::string path = hierarchy.path, ours(kRootName);
  while (directory) {
    addMinimums(directory.get(), path, ours, holders);
    // The root of the whole hierarchy has no such file.
    if (!hasControl(directory.get(), infoOf(Control::kMemoryMin).name)) return;
    const size_t slash = path.rfind('/');
    ours = path.substr(slash + 1);
    path.erase(slash);
    directory = UniqueFd(::openat(directory.get(), "..", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  }
}

}  // namespace

int64_t Account::capacity() const {
  int64_t left = total;
  for (const Holder &holder : holders) left = std::max<int64_t>(left - holder.amount, 0);
  return left;
}

Account readAccount(Resource resource, const Hierarchy &hierarchy, const HostFacts &facts,
                    const Reserve &reserve) {
  Account account;
  account.resource = resource;
  account.total = machineCapacity(facts, resource);
  const int64_t kept = reserveFor(resource, account.total, reserve);
  if (kept > 0) account.holders.push_back({"the system", kept});
  if (resource == Resource::kCpu) return account;
  const int64_t huge = hugePagesMB(memInfo());
  if (huge > 0) account.holders.push_back({"huge pages", huge});
  addForeignMinimums(hierarchy, account.holders);
  return account;
}

const Account &Capacity::account(Resource resource) {
  Reading &reading = resource == Resource::kMemory ? memory_ : cpu_;
  const auto now = std::chrono::steady_clock::now();
  if (!reading.account || now - reading.time > kMaxAge) {
    reading = {readAccount(resource, hierarchy_, facts_, reserve_), now};
  }
  return *reading.account;
}

std::string textOf(const Account &account) {
  std::string text;
  for (const auto &[name, amount] : account.holders) {
    text += (text.empty() ? "" : ", ") + std::to_string(amount) + " " + unitOf(account.resource) +
            " for " + name;
  }
  return text.empty() ? "nothing" : text;
}

const char *unitOf(Resource resource) {
  return resource == Resource::kMemory ? "MB" : "% of a CPU";
}

int64_t hugePagesMB(std::string_view meminfo) {
  // "Hugetlb:         4096 kB", of all sizes; absent in a kernel without huge pages.
  constexpr std::string_view kKey = "Hugetlb:";
  const size_t line = meminfo.find(kKey);
  if (line == std::string_view::npos) return 0;
  const size_t start = meminfo.find_first_not_of(' ', line + kKey.size());
  int64_t kilobytes = 0;
  if (start == std::string_view::npos) return 0;
  (void)std::from_chars(meminfo.data() + start, meminfo.data() + meminfo.size(), kilobytes);
  return (kilobytes + 1023) / 1024;
}

}  // namespace Knob::Linux
