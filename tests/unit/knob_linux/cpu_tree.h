// SPDX-License-Identifier: Apache-2.0
// A tree of groups as numbers: weighs it with the functions under test, and calculates what each
// group then gets of the machine. Knows nothing of any kernel.
#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "knob/linux/cpu_weights.h"

namespace Knob::Linux {

class CpuTree {
 public:
  static constexpr size_t kHost = 0;

  struct Group {
    size_t parent = kHost;
    size_t level = 0;  // of host: 0
    std::vector<size_t> children;
    int64_t min = 0;  // percent of one CPU
    int64_t shareWeight = 100;
    int64_t reservation = 0;  // percent: the larger of min and the children's sum
    int64_t childrenReservation = 0;
    uint64_t childrenShareWeight = 0;
    CpuDivision division;  // of its time among its children
    int64_t weight = 100;
    bool isBusy = true;
    double part = 0;  // of the machine, while all busy groups want all they can get
    double fair = 0;  // the same, were weights any numbers: its reservation, and by its shares of
                      // what is free
  };

  explicit CpuTree(uint32_t cpus) : cpus_(cpus), groups_(1) {}

  size_t add(size_t parent, int64_t shareWeight);
  // Only a group without children.
  void remove(size_t group);
  void setMin(size_t group, int64_t percent);
  void setShareWeight(size_t group, int64_t shareWeight);
  void setOthersWeight(uint64_t weight) { othersWeight_ = weight; }

  // Weighs the group that was changed, and all that has to be written anew for it; for a group that
  // was removed, its parent. False: host's reservation can't be kept; nothing is changed.
  bool settle(size_t changed);

  // Weighs every group, as if none had a weight yet. False: as above.
  bool weighAll();

  // Sets part and fair of all groups. Groups without children are busy as isBusy has it; the others
  // when any of their children is.
  void calculateParts();

  void setBusy(size_t group, bool isBusy) { groups_[group].isBusy = isBusy; }
  const std::vector<Group> &groups() const { return groups_; }
  const Group &operator[](size_t group) const { return groups_[group]; }
  double reserved(const Group &group) const { return partOf(group.reservation); }
  double partOf(int64_t percent) const { return static_cast<double>(percent) / (100.0 * cpus_); }

  // What host may take at most, but for the tolerance: the larger of its fair part, and of its
  // reservation and a twentieth of the rest.
  double hostAllowed() const;

  // The least part of the machine that host needs for every reservation below it to be kept by
  // weights from 1 to 10,000, whatever the scheme.
  double leastHostPart() const;

  // How often the children of one group were written anew, and how many weights were written.
  uint64_t rewrites() const { return rewrites_; }
  uint64_t writes() const { return writes_; }

 private:
  CpuChild childOf(const Group &group) const;
  CpuDivision divisionOf(const Group &group, MachinePart guaranteed) const;
  void sumUp(size_t group);
  std::optional<HostCpu> weighHost();
  void settleBelow(size_t group, MachinePart guaranteed, const std::vector<size_t> &chain);
  bool updateBusy(size_t group);
  void calculateBelow(size_t group);
  double leastPart(size_t group) const;

  uint32_t cpus_;
  uint64_t othersWeight_ = 0;
  std::vector<Group> groups_;
  uint64_t rewrites_ = 0, writes_ = 0;
};

}  // namespace Knob::Linux
