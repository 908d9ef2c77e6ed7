// SPDX-License-Identifier: Apache-2.0
// One function for each way. The texts of single values are made and read in control_values.
#include "knob/linux/file_values.h"

#include <algorithm>
#include <limits>

#include "knob/admission.h"
#include "knob/linux/control_values.h"
#include "knob/peaks.h"

namespace Knob::Linux {
namespace {

uint64_t limitIn(const Group &group, Control control) {
  const auto text = readControlIfAny(group.directory, rowOf(control).name);
  const uint64_t fresh = parseLimit(rowOf(control).fresh).value_or(0);
  return text ? parseLimit(*text).value_or(fresh) : fresh;
}

}  // namespace

Values valuesOf(Resource resource, const ResourceState &books, uint32_t cpus) {
  const int64_t reservation = reservationOf(books);
  const Allocation &allocation = books.allocation;
  if (resource == Resource::kMemory) {
    return {Value{Control::kMemoryMin, memoryText(reservation)},
            Value{Control::kMemoryMax, memoryText(allocation.max)}};
  }
  return {
      Value{Control::kCpuWeight, std::to_string(cpuWeight(allocation.shares, reservation, cpus))},
      Value{Control::kCpuMax, cpuMaxText(allocation.max)}};
}

Record readFiles(const Group &group) {
  Record record;
  record.memory.allocation.min = minimumMegabytes(limitIn(group, Control::kMemoryMin));
  record.memory.allocation.max = maximumMegabytes(limitIn(group, Control::kMemoryMax));
  record.cpu.allocation.shares = sharesOfWeight(limitIn(group, Control::kCpuWeight));
  const auto bandwidth = readControlIfAny(group.directory, rowOf(Control::kCpuMax).name);
  constexpr int64_t kMostPercent = std::numeric_limits<int32_t>::max();
  if (bandwidth) {
    record.cpu.allocation.max = std::min(parseCpuMax(*bandwidth).value_or(-1), kMostPercent);
  }
  record.peaks = raisedPeaks({}, record.memory.allocation.min, 0);
  return record;
}

}  // namespace Knob::Linux
