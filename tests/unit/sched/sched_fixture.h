// SPDX-License-Identifier: Apache-2.0
// Runs scheduler-group operations against the recording libknob, in this process.
#pragma once

#include <gtest/gtest.h>

#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "recording_knob.h"
#include "sched/exception.h"
#include "sched/scheduler_group.h"
#include "stand_ins.h"

namespace Test {

using Calls = std::vector<std::string>;

class Sched : public testing::Test {
 protected:
  Sched() {
    for (const char *name :
         {"RECORDING_KNOB_TRACE", "RECORDING_KNOB_SCRIPT", "RECORDING_KNOB_GROUPS"})
      setenv(name, world.environment.at(name).c_str(), 1);
  }

  // Runs OPERATION to the end of the recording; what it threw, if anything.
  std::optional<::Sched::Exception> failureOf(const std::function<void()> &operation) {
    std::optional<::Sched::Exception> failure;
    try {
      operation();
    } catch (const ::Sched::Exception &e) {
      failure = e;
      noteNested(e);
    }
    RecordingKnobEnd();
    EXPECT_EQ(world.misuse(), Calls{});
    return failure;
  }

  void succeed(const std::function<void()> &operation) {
    const std::optional<::Sched::Exception> failure = failureOf(operation);
    if (failure) ADD_FAILURE() << failure->what();
  }

  static ::Sched::MemAllocation mem(int64_t min, int64_t max, int64_t shares, int64_t minLimit) {
    return {min, max, shares, minLimit, 0};
  }

  static ::Sched::CpuAllocation cpu(int32_t min, int32_t max, int32_t shares, int32_t minLimit) {
    return {min, max, shares, minLimit, 0};
  }

  StandInWorld world;
  std::string nestedWhat;  // of the exception inside the last failure; empty: none

 private:
  void noteNested(const std::exception &outer) {
    try {
      std::rethrow_if_nested(outer);
    } catch (const ::Sched::Exception &inner) {
      nestedWhat = inner.what();
    }
  }
};

}  // namespace Test
