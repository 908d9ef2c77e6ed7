// SPDX-License-Identifier: Apache-2.0
// One kernel behind libknob. The node table turns every KNOB call into one call of this interface;
// what all kernels must refuse alike (names, allocations, admission, peaks) stands in plain
// functions beside it, and a kernel calls those.
//
// Every operation is atomic against those of other processes, changes nothing when it fails, and
// fails by throwing KernelError with the status that the caller of libknob gets.
#pragma once

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>
#include <vector>

#include "knob/status.h"

namespace Knob {

using GroupId = int64_t;

enum class Resource { kMemory, kCpu };

// What a group may have of one resource: MB of memory, or percent of one CPU.
struct Allocation {
  int64_t min = 0;
  int64_t max = -1;       // -1: no limit
  int64_t minLimit = -1;  // -1: no limit
  int64_t shares = -3;    // -2 low, -3 normal, -4 high, or 0 and up
};

// The settings of an Allocation that one call changes; the others stay.
struct AllocationChange {
  std::optional<int64_t> min, max, minLimit, shares;
};

// The highest values in the group's life, in KB.
struct MemoryStatistics {
  uint64_t ownReservedPeakKB = 0;       // of the group's own min
  uint64_t childrenReservedPeakKB = 0;  // of the sum of its children's reservations
};

struct HostFacts {
  uint32_t cpus = 0;
  uint32_t maxVms = 0;
  bool isVm = false;
  uint64_t memoryKB = 0;
  std::string bootCommandLine;
};

// What a libknob is known by: the md5 of its interface and the date of its build.
struct BuildSignature {
  std::string md5;
  std::string buildDate;
};

// What people are shown of a group beside its allocations. Absent: this kernel cannot tell.
struct GroupUsage {
  std::optional<uint64_t> memoryBytes;
  std::optional<uint64_t> cpuMicroseconds;  // since the group was made
};

struct GroupView {
  GroupId id = 0;
  std::string name;
  Allocation memory, cpu;
  int64_t memoryReservationMB = 0;  // the larger of its own min and its children's sum
  int64_t cpuReservationPercent = 0;
  GroupUsage usage;
  std::string deviation;  // how the group differs from what its record says; empty: it does not
};

// One thing that check() found, as a line for people.
struct Finding {
  std::string path;
  std::string text;
  bool repaired = false;
};

class KernelError : public std::runtime_error {
 public:
  // detail: what, where and what the system answered, for people; may be empty.
  explicit KernelError(Status failure, const std::string &detail = {})
      : std::runtime_error(detail), status(failure) {}

  const Status status;
};

class Kernel {
 public:
  virtual ~Kernel() = default;

  // The group of that path, looked up component by component. Not found.
  virtual GroupId lookUp(std::string_view path) = 0;

  // Makes a group with the default allocations. Bad parameter (name), not found (parent), exists,
  // busy (living members in the parent), out of memory (the parent, or a group above it, may have
  // none, as far as this process has seen).
  virtual GroupId create(GroupId parent, std::string_view name) = 0;

  // Not found; busy (child groups or living members); permission denied (the two fixed groups).
  virtual void remove(GroupId id) = 0;

  virtual Allocation readAllocation(GroupId id, Resource resource) = 0;

  // Checks the whole change, then applies the whole. Not found, bad parameter, reservation refused,
  // memory busy.
  virtual void setAllocation(GroupId id, Resource resource, const AllocationChange &change) = 0;

  virtual std::vector<GroupId> childGroups(GroupId id) = 0;

  // The process ids of the living members.
  virtual std::vector<int64_t> members(GroupId id) = 0;

  // Moves a process into a group. Not found (group or process), busy (the group has child groups),
  // out of memory (the group, or one above it, may have none: the process could not live there).
  virtual void join(GroupId id, int64_t pid) = 0;

  virtual MemoryStatistics memoryStatistics(GroupId id) = 0;
  virtual HostFacts facts() = 0;

  // Of the library that this kernel was started with.
  virtual BuildSignature signature() = 0;

  // A group as people see it.
  virtual GroupView view(GroupId id) = 0;

  // Recounts what is kept. repair: mends what is wrong.
  virtual std::vector<Finding> check(bool repair) = 0;
};

}  // namespace Knob
