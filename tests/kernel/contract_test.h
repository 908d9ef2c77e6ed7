// SPDX-License-Identifier: Apache-2.0
// The fixture of every case of the contract: a newly started kernel, with a group for the case.
#pragma once

#include <gtest/gtest.h>

#include "calls.h"
#include "kernel_under_test.h"

namespace Contract {

class ContractTest : public testing::Test {
 protected:
  ContractTest() { kernelUnderTest().startAnew(); }

  // What every case must leave: records that agree with the tree.
  void TearDown() override { EXPECT_TRUE(kernelUnderTest().check(false).empty()); }
};

}  // namespace Contract
