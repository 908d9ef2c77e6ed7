// SPDX-License-Identifier: Apache-2.0
// A moment until which something may take. Waiting is always for what is left until then.
#pragma once

#include <algorithm>
#include <chrono>

namespace Kestrel::Etcd {

class Deadline {
 public:
  using Clock = std::chrono::steady_clock;

  explicit Deadline(std::chrono::milliseconds time) : end_(Clock::now() + time) {}

  // Never negative. A started millisecond counts as a whole one.
  std::chrono::milliseconds left() const {
    const auto rest = std::chrono::ceil<std::chrono::milliseconds>(end_ - Clock::now());
    return std::max(rest, std::chrono::milliseconds::zero());
  }
  bool passed() const { return left() == std::chrono::milliseconds::zero(); }

 private:
  Clock::time_point end_;
};

}  // namespace Kestrel::Etcd
