// SPDX-License-Identifier: Apache-2.0
// The world of a test of CPU settings: busy processes in groups, slices of other programs, and what
// share each group gets by the kernel's own account.
#pragma once

#include <gtest/gtest.h>

#include <chrono>
#include <filesystem>
#include <memory>
#include <string>
#include <thread>
#include <vector>

#include "linux_world.h"

namespace Uml {

// What share of the time that passes a group uses, in percent of one CPU.
class Meter {
 public:
  explicit Meter(const std::string &group)
      : group_(group), used_(usedNow()), since_(std::chrono::steady_clock::now()) {}

  double percent() const {
    const std::chrono::duration<double, std::micro> passed =
        std::chrono::steady_clock::now() - since_;
    return 100.0 * static_cast<double>(usedNow() - used_) / passed.count();
  }

 private:
  int64_t usedNow() const { return numberIn(group_, "cpu.stat", "usage_usec"); }

  std::string group_;
  int64_t used_;
  std::chrono::steady_clock::time_point since_;
};

// Long enough for 60 of the kernel's periods, over which it keeps its promises.
inline void measure(std::chrono::seconds time = std::chrono::seconds(6)) {
  std::this_thread::sleep_for(time);
}

// What the groups used of the time that passed in all of them, in percent.
inline std::vector<double> partsOf(const std::vector<std::string> &groups,
                                   std::chrono::seconds time = std::chrono::seconds(6)) {
  std::vector<Meter> meters;
  for (const std::string &group : groups) meters.emplace_back(group);
  measure(time);
  std::vector<double> parts;
  double sum = 0;
  for (const Meter &meter : meters) sum += parts.emplace_back(meter.percent());
  for (double &part : parts) part *= 100 / sum;
  return parts;
}

class CpuTest : public LinuxTest {
 protected:
  // A group of another program beside host.
  static void makeSlice(const std::string &name, int weight) {
    std::filesystem::create_directory(kMount / name);
    writeControl("", "cgroup.subtree_control", "+memory +cpu");
    writeControl(name, "cpu.weight", std::to_string(weight));
  }

  void addBusyProcess(const std::string &group) {
    workers_.push_back(std::make_unique<Worker>(group, beBusy));
  }

 private:
  std::vector<std::unique_ptr<Worker>> workers_;
};

}  // namespace Uml
