// SPDX-License-Identifier: Apache-2.0
// Linux adds oom_score_adj thousandths of memory and swap to the pages that a process uses.
#include "knob/linux/oom_score.h"

#include <fcntl.h>
#include <sys/sysinfo.h>

#include <algorithm>
#include <charconv>
#include <string>

#include "common/unique_fd.h"
#include "knob/linux/cgroup_files.h"

namespace Knob::Linux {
namespace {

constexpr int kMinAdj = -999;  // -1000 would mean: never
constexpr uint64_t kMegabyte = uint64_t{1024} * 1024;
constexpr const char *kAdjFile = "oom_score_adj";
// The first keeps systemd-oomd away as long as there is another choice, the second always.
constexpr const char *kOomdMarks[] = {"user.oomd_avoid", "user.oomd_omit"};

Platform::UniqueFd openProcess(int64_t pid) {
  const std::string path = "/proc/" + std::to_string(pid);
  return Platform::UniqueFd(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
}

// Nothing: the process has ended.
std::optional<int> valueOf(const Platform::UniqueFd &process) {
  try {
    const auto text = process ? readControlIfAny(process.get(), kAdjFile) : std::nullopt;
    int value = 0;
    if (!text) return std::nullopt;
    const auto [stop, error] = std::from_chars(text->data(), text->data() + text->size(), value);
    return error == std::errc() ? std::optional<int>(value) : std::nullopt;
  } catch (const KernelError &) {
    return std::nullopt;
  }
}

}  // namespace

int oomScoreAdjFor(int64_t minMB, uint64_t machineBytes) {
  const uint64_t machineMB = machineBytes / kMegabyte;
  if (minMB <= 0) return 0;
  const auto min = static_cast<uint64_t>(minMB);
  if (min >= machineMB) return kMinAdj;
  const auto thousandths = static_cast<int>((min * 1000 + machineMB - 1) / machineMB);
  return std::max(-thousandths, kMinAdj);
}

uint64_t oomMachineBytes() {
  struct sysinfo info {};
  (void)::sysinfo(&info);  // fails only for a bad address
  return (uint64_t{info.totalram} + info.totalswap) * info.mem_unit;
}

std::optional<int> readOomScoreAdj(int64_t pid) {
  return valueOf(openProcess(pid));
}

bool changeOomScoreAdj(int64_t pid, int former, int wanted) {
  const Platform::UniqueFd process = openProcess(pid);
  const std::optional<int> value = valueOf(process);
  if (!value || *value == wanted || (*value != 0 && *value != former)) return true;
  const int error = writeControl(process.get(), kAdjFile, std::to_string(wanted));
  return error == 0 || statusOf(error) == Status::kNotFound;
}

std::vector<int64_t> withoutOomScoreAdj(const std::vector<int64_t> &pids, int wanted) {
  std::vector<int64_t> without;
  if (wanted == 0) return without;
  for (const int64_t pid : pids) {
    if (readOomScoreAdj(pid) == 0) without.push_back(pid);
  }
  return without;
}

void markForOomd(int directory, bool hasMinimum) noexcept {
  for (const char *mark : kOomdMarks) {
    try {
      if (hasMinimum) {
        writeAttribute(directory, mark, "1");
      } else {
        removeAttribute(directory, mark);
      }
    } catch (const std::exception &) {
      // See the header.
    }
  }
}

}  // namespace Knob::Linux
