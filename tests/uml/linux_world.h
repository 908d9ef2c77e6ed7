// SPDX-License-Identifier: Apache-2.0
// The world of one test inside the machine: the programs of the build on the Linux kernel, and a
// tree without any group, at the test's begin and at its end.
#pragma once

#include <gtest/gtest.h>

#include <string>

#include "control_files.h"
#include "worker.h"
#include "world.h"

namespace Uml {

class LinuxTest : public testing::Test {
 protected:
  LinuxTest() {
    ::Test::writeFile(world.folder() / "knob.conf", "kernel = linux\n");
    removeGroups({});
  }
  ~LinuxTest() override { removeGroups({}); }

  // Writes a definition file, and loads it.
  ::Test::ProcessResult load(const std::string &yaml) {
    return world.poolctl({"load", world.file("pools.yaml", yaml)});
  }

  ::Test::World world;
};

// The program ended well and said nothing.
inline testing::AssertionResult silentlyDone(const ::Test::ProcessResult &result) {
  if (result.status == 0 && result.out.empty() && result.err.empty())
    return testing::AssertionSuccess();
  return testing::AssertionFailure()
         << "status " << result.status << ", signal " << result.signal << "\n"
         << result.out << result.err;
}

}  // namespace Uml
