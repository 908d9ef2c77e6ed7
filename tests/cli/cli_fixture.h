// SPDX-License-Identifier: Apache-2.0
// What the tests of the program as a process share: a world with the stand-ins, a private /etc,
// and claims about one run.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "stand_ins.h"

namespace Test {

using Calls = std::vector<std::string>;

// A run that ended in order, its streams and status at once, so that a failing test shows all
// three.
inline void expectRun(const ProcessResult &result, int status, const std::string &out,
                      const std::string &err) {
  EXPECT_EQ(result.out, out);
  EXPECT_EQ(result.err, err);
  EXPECT_EQ(result.status, status);
  EXPECT_EQ(result.signal, 0);
}

class Cli : public testing::Test {
 protected:
  // A parameter list that the program misuses fails whatever test it happens in.
  void TearDown() override {
    if (world.ranPoolctl()) {
      EXPECT_EQ(world.misuse(), Calls{});
    }
  }

  StandInWorld world;
};

// The same with definitions in /etc/rp.d.
class CliWithRpD : public Cli {
 protected:
  void SetUp() override {
    SKIP_WITHOUT_PRIVATE_ETC();
    world.rpD();
  }
};

// The nine titles and a pool's nine values as the table shows them.
std::string tableLine(const std::vector<std::string> &columns);

inline const std::string kCsvHeader =
    "name,auto,memMin,memMax,memMinLimit,memShares,cpuMin,cpuMax,cpuShares\n";

}  // namespace Test
