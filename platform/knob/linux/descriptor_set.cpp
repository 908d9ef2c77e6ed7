// SPDX-License-Identifier: Apache-2.0
// Only runs of numbers that are all owned here are closed at once, so no other thread's descriptor
// can be among them.
#include "knob/linux/descriptor_set.h"

#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <utility>

namespace Knob::Linux {
namespace {

bool closedAtOnce(int first, int last) noexcept {
#ifdef SYS_close_range
  return first != last && ::syscall(SYS_close_range, first, last, 0) == 0;
#else
  return false;
#endif
}

// A failing close says nothing of use: whatever was written was written in one call that answered.
void closeRun(int first, int last) noexcept {
  if (closedAtOnce(first, last)) return;
  for (int descriptor = first; descriptor <= last; ++descriptor) (void)::close(descriptor);
}

}  // namespace

DescriptorSet::DescriptorSet(DescriptorSet &&other) noexcept
    : descriptors_(std::exchange(other.descriptors_, {})) {}

DescriptorSet &DescriptorSet::operator=(DescriptorSet &&other) noexcept {
  if (this != &other) {
    closeAll();
    descriptors_ = std::exchange(other.descriptors_, {});
  }
  return *this;
}

void DescriptorSet::add(int descriptor) {
  try {
    descriptors_.push_back(descriptor);
  } catch (...) {
    (void)::close(descriptor);
    throw;
  }
}

void DescriptorSet::take(DescriptorSet &&other) {
  descriptors_.insert(descriptors_.end(), other.descriptors_.begin(), other.descriptors_.end());
  other.descriptors_.clear();
}

void DescriptorSet::closeAll() noexcept {
  std::sort(descriptors_.begin(), descriptors_.end());
  for (size_t first = 0; first < descriptors_.size();) {
    size_t last = first;
    while (last + 1 < descriptors_.size() && descriptors_[last + 1] == descriptors_[last] + 1) {
      ++last;
    }
    closeRun(descriptors_[first], descriptors_[last]);
    first = last + 1;
  }
  descriptors_.clear();
}

}  // namespace Knob::Linux
