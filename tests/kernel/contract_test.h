// SPDX-License-Identifier: Apache-2.0
// The frame of every case of the contract: a kernel started anew, with a group of the case's own.
#pragma once

#include <gtest/gtest.h>

#include "calls.h"
#include "kernel_under_test.h"

namespace Contract {

class ContractTest : public testing::Test {
 protected:
  ContractTest() { kernelUnderTest().startAnew(); }

  // What every case must leave: books that agree with the tree.
  void TearDown() override { EXPECT_TRUE(kernelUnderTest().check(false).empty()); }
};

}  // namespace Contract
