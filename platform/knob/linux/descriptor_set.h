// SPDX-License-Identifier: Apache-2.0
// Owns many descriptors and closes them together: neighbouring numbers cost one call, whatever
// their count, where one close for each would be a third of all the calls that a new group costs.
#pragma once

#include <vector>

namespace Knob::Linux {

class DescriptorSet {
 public:
  DescriptorSet() = default;
  DescriptorSet(DescriptorSet &&other) noexcept;
  DescriptorSet &operator=(DescriptorSet &&other) noexcept;
  DescriptorSet(const DescriptorSet &) = delete;
  DescriptorSet &operator=(const DescriptorSet &) = delete;
  ~DescriptorSet() { closeAll(); }

  // Takes over an open descriptor; when there is no memory to remember it, it is closed.
  void add(int descriptor);

  // Takes over all that another set owns.
  void take(DescriptorSet &&other);

 private:
  void closeAll() noexcept;

  std::vector<int> descriptors_;
};

}  // namespace Knob::Linux
