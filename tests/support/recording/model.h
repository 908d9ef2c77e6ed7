// SPDX-License-Identifier: Apache-2.0
// The groups and facts of the recording libknob: plain values in memory, read from a script and
// written out at the end. The model accepts every reservation; only rules of the script refuse one.
#pragma once

#include <cstdint>
#include <istream>
#include <ostream>
#include <string>
#include <vector>

#include "platform/knob_status.h"

namespace Recording {

inline constexpr uint32_t kNotFound = KNOB_STATUS_NOT_FOUND;
inline constexpr uint32_t kBusy = KNOB_STATUS_BUSY;
inline constexpr uint32_t kExists = KNOB_STATUS_EXISTS;
inline constexpr uint32_t kBadParameter = KNOB_STATUS_BAD_PARAMETER;

struct Allocation {
  int64_t min = 0, max = -1, minLimit = -1, shares = -3;
};

struct Group {
  int64_t id = 0;
  std::string path;
  Allocation memory, cpu;
  uint64_t ownPeakKB = 0, childrenPeakKB = 0;
  int emptiesAfter = -1;  // its child groups vanish after so many listings; -1: never
};

// A rule of the script: the calls that match it fail, or send the program a signal. An empty text
// matches everything.
struct Rule {
  std::string function, node, group;
  uint32_t status = 0;  // 0: the call does not fail
  int signal = 0;       // sent before the call is answered; 0: none
  int from = 1;         // the first matching call
  int count = 1;        // how many follow it, itself included; 0: all
  int seen = 0;         // matching calls so far

  bool strikes(const std::string &calledFunction, const std::string &calledNode,
               const std::string &calledGroup);
};

struct Model {
  std::vector<Group> groups;
  std::vector<Rule> rules;
  uint32_t cpus = 8, maxVms = 1024;
  bool isVm = false;
  uint64_t memoryKB = 16777216;
  std::string commandLine = "quiet";
  int mismatchFrom = 0;  // the first KNOB_CheckSig that reports a mismatch; 0: none
  std::string ownBuild, runningBuild;
  int64_t nextId = 101;

  Model();

  // Reads the lines of a script (see README.md in this folder). Throws std::runtime_error on an
  // unknown one.
  void read(std::istream &script);
  void writeGroups(std::ostream &out) const;

  Group *find(int64_t id);
  Group *find(const std::string &path);
  std::vector<int64_t> children(const Group &group) const;
  uint32_t create(const std::string &path, int64_t *id);
  uint32_t remove(int64_t id);
};

// Applies "key=value" settings to an allocation.
uint32_t apply(const std::vector<std::string> &settings, Allocation *allocation);

}  // namespace Recording
