// SPDX-License-Identifier: Apache-2.0
// What the contract's cases need of the kernel that they are run against, beside libknob itself. A
// second kernel is put under the suite with a file like emulated_under_test.cpp.
#pragma once

#include <string>
#include <vector>

namespace Contract {

inline constexpr int kCpus = 4;
inline constexpr int kMemoryMB = 4096;
inline constexpr int kMaxVms = 77;
inline constexpr const char *kCommandLine = "quiet boot=disk runotter2";

class KernelUnderTest {
 public:
  virtual ~KernelUnderTest() = default;

  // Leaves libknob's calls with a kernel that has no groups but host and host/opt, on a machine of
  // kMemoryMB and kCpus that is a virtual one.
  virtual void startAnew() = 0;

  // The findings of the kernel's own check, one a line; repair: repairs them.
  virtual std::vector<std::string> check(bool repair) = 0;
};

// The one kernel of this test program.
KernelUnderTest &kernelUnderTest();

}  // namespace Contract
