// SPDX-License-Identifier: Apache-2.0
// The highest values of a group's life, kept in KB although memory is reserved in MB.
#pragma once

#include <algorithm>
#include <cstdint>
#include <limits>

#include "knob/kernel.h"

namespace Knob {

// Saturates: an amount that KB cannot express is the most that they can.
constexpr uint64_t kilobytes(int64_t megabytes) {
  constexpr uint64_t kMax = std::numeric_limits<uint64_t>::max();
  const auto amount = static_cast<uint64_t>(megabytes);
  return amount > kMax / 1024 ? kMax : amount * 1024;
}

// Raises the peaks to what is reserved now.
inline MemoryStatistics raisedPeaks(const MemoryStatistics &peaks, int64_t ownMinMB,
                                    int64_t childrenSumMB) {
  return {std::max(peaks.ownReservedPeakKB, kilobytes(ownMinMB)),
          std::max(peaks.childrenReservedPeakKB, kilobytes(childrenSumMB))};
}

}  // namespace Knob
