// SPDX-License-Identifier: Apache-2.0
// One call of the interface is one call of the kernel, and every misuse is a status of its own.
#include "knob/node_table.h"

#include <gtest/gtest.h>

#include <cstring>
#include <functional>

#include "fake_kernel.h"
#include "knob/param_list.h"
#include "platform/knob_records.h"

namespace Knob {
namespace {

using Calls = std::vector<std::string>;

KNOB_ParamList list(ListKind kind, std::vector<ListEntry> entries) {
  const size_t size = entries.size();
  return {kind, size, std::move(entries)};
}

KNOB_ParamList group(int64_t id = 5) {
  return list(ListKind::kInstance, {id});
}

KNOB_ParamList input(std::vector<ListEntry> entries) {
  return list(ListKind::kInput, std::move(entries));
}

ListEntry text(const char *bytes) {
  return std::string(bytes);
}

// A list that the node takes.
KNOB_ParamList goodInput(const Node &node) {
  switch (node.input) {
    case InputShape::kOneText:
      return input({text("name")});
    case InputShape::kOneInt:
      return input({int64_t{77}});
    case InputShape::kSettings:
      return input({text("min=3")});
    case InputShape::kNothing:
      break;
  }
  return input({});
}

Status statusOf(const std::function<void()> &call) {
  try {
    call();
  } catch (const KernelError &error) {
    return error.status;
  }
  return Status::kSuccess;
}

class NodeTable : public testing::Test {
 protected:
  Status get(const Node &node, const KNOB_ParamList *instance, void *output, size_t size) {
    return statusOf([&] { getNode(kernel_, node.id, instance, output, size); });
  }
  Status set(const Node &node, const KNOB_ParamList *instance, const KNOB_ParamList *arguments,
             void *output, size_t size) {
    return statusOf([&] { setNode(kernel_, node.id, instance, arguments, output, size); });
  }
  Status enumerate(const Node &node, const KNOB_ParamList *instance) {
    return statusOf([&] { (void)listNode(kernel_, node.id, instance); });
  }
  // Calls each verb that the node has with that instance.
  void expectOfEachVerb(const Node &node, const KNOB_ParamList *instance, Status expected) {
    const KNOB_ParamList arguments = goodInput(node);
    if (node.get) {
      EXPECT_EQ(get(node, instance, output_.data(), output_.size()), expected);
    }
    if (node.set) {
      EXPECT_EQ(set(node, instance, &arguments, output_.data(), output_.size()), expected);
    }
    if (node.list) {
      EXPECT_EQ(enumerate(node, instance), expected);
    }
  }
  void expectUntouched() {
    for (const char byte : output_) ASSERT_EQ(byte, 'x');
    EXPECT_EQ(kernel_.calls, Calls());
  }

  FakeKernel kernel_;
  std::vector<char> output_ = std::vector<char>(8192, 'x');
};

TEST_F(NodeTable, EveryNodeHasANumberAndCanDoSomething) {
  for (const Node &node : nodeTable()) {
    EXPECT_NE(node.id, 0);
    EXPECT_TRUE(node.get || node.set || node.list) << node.id;
    EXPECT_EQ(node.get != nullptr, node.getSize != 0) << node.id;
  }
}

TEST_F(NodeTable, AGoodCallIsOneCallOfTheKernel) {
  for (const Node &node : nodeTable()) {
    const KNOB_ParamList instance = group();
    const KNOB_ParamList *given = node.ofGroup ? &instance : nullptr;
    kernel_.calls.clear();
    expectOfEachVerb(node, given, Status::kSuccess);
    const int verbs = (node.get ? 1 : 0) + (node.set ? 1 : 0) + (node.list ? 1 : 0);
    EXPECT_EQ(kernel_.calls.size(), static_cast<size_t>(verbs)) << node.id;
  }
}

TEST_F(NodeTable, AnUnknownNodeIsABadNode) {
  const Node unknown = Node().numbered(0xffff);
  EXPECT_EQ(get(unknown, nullptr, output_.data(), 8), Status::kBadNode);
  EXPECT_EQ(set(unknown, nullptr, nullptr, output_.data(), 8), Status::kBadNode);
  EXPECT_EQ(enumerate(unknown, nullptr), Status::kBadNode);
  expectUntouched();
}

TEST_F(NodeTable, AVerbThatANodeDoesNotHaveIsNotSupported) {
  const KNOB_ParamList instance = group();
  for (const Node &node : nodeTable()) {
    const KNOB_ParamList arguments = goodInput(node);
    if (!node.get) {
      EXPECT_EQ(get(node, &instance, output_.data(), 8192), Status::kNotSupported) << node.id;
    }
    if (!node.set) {
      EXPECT_EQ(set(node, &instance, &arguments, output_.data(), 8192), Status::kNotSupported);
    }
    if (!node.list) {
      EXPECT_EQ(enumerate(node, &instance), Status::kNotSupported) << node.id;
    }
  }
  expectUntouched();
}

TEST_F(NodeTable, AMissingOrSmallOutputIsABufferSize) {
  const KNOB_ParamList instance = group();
  for (const Node &node : nodeTable()) {
    const KNOB_ParamList *given = node.ofGroup ? &instance : nullptr;
    const KNOB_ParamList arguments = goodInput(node);
    for (const size_t size : {size_t{0}, std::max(node.getSize, node.setSize) - 1}) {
      if (node.get) {
        EXPECT_EQ(get(node, given, output_.data(), size), Status::kBufferSize);
      }
      if (node.setSize != 0) {
        EXPECT_EQ(set(node, given, &arguments, output_.data(), size), Status::kBufferSize);
      }
    }
    if (node.get) {
      EXPECT_EQ(get(node, given, nullptr, 8192), Status::kBufferSize);
    }
    if (node.setSize != 0) {
      EXPECT_EQ(set(node, given, &arguments, nullptr, 8192), Status::kBufferSize);
    }
  }
  expectUntouched();
}

TEST_F(NodeTable, EveryWrongInstanceIsABadParameter) {
  const KNOB_ParamList wrongs[] = {list(ListKind::kInput, {int64_t{5}}),
                                   list(ListKind::kInstance, {int64_t{5}, int64_t{6}}),
                                   list(ListKind::kInstance, {text("5")})};
  const KNOB_ParamList empty = list(ListKind::kInstance, {});
  const KNOB_ParamList good = group();
  for (const Node &node : nodeTable()) {
    for (const KNOB_ParamList &wrong : wrongs) {
      expectOfEachVerb(node, &wrong, Status::kBadParameter);
    }
    if (node.ofGroup) {
      expectOfEachVerb(node, nullptr, Status::kBadParameter);
      expectOfEachVerb(node, &empty, Status::kBadParameter);
    } else {
      expectOfEachVerb(node, &good, Status::kBadParameter);
    }
  }
  expectUntouched();
}

TEST_F(NodeTable, AnEmptyInstanceListIsNoInstance) {
  const KNOB_ParamList empty = list(ListKind::kInstance, {});
  for (const Node &node : nodeTable()) {
    if (!node.ofGroup) expectOfEachVerb(node, &empty, Status::kSuccess);
  }
}

TEST_F(NodeTable, EveryWrongInputIsABadParameter) {
  const KNOB_ParamList instance = group();
  for (const Node &node : nodeTable()) {
    if (!node.set) continue;
    const KNOB_ParamList *given = node.ofGroup ? &instance : nullptr;
    const bool wantsInt = node.input == InputShape::kOneInt;
    const ListEntry good = goodInput(node).entries.empty() ? text("x") : goodInput(node).entries[0];
    std::vector<KNOB_ParamList> wrongs = {
        list(ListKind::kInstance, {good}),
        input({wantsInt ? text("77") : ListEntry(int64_t{77})}),
        input({good, good, good}),
    };
    if (node.input != InputShape::kNothing) {
      wrongs.push_back(input({}));
      EXPECT_EQ(set(node, given, nullptr, output_.data(), 8192), Status::kBadParameter);
    }
    for (const KNOB_ParamList &wrong : wrongs) {
      EXPECT_EQ(set(node, given, &wrong, output_.data(), 8192), Status::kBadParameter) << node.id;
    }
  }
  expectUntouched();
}

TEST_F(NodeTable, WhatTheKernelRefusesPassesThroughAndTheOutputStays) {
  const KNOB_ParamList instance = group();
  kernel_.answer = Status::kReservationRefused;
  for (const Node &node : nodeTable()) {
    expectOfEachVerb(node, node.ofGroup ? &instance : nullptr, Status::kReservationRefused);
  }
  for (const char byte : output_) ASSERT_EQ(byte, 'x');
}

template <typename T>
T at(const std::vector<char> &bytes, size_t offset) {
  T value;
  std::memcpy(&value, bytes.data() + offset, sizeof(value));
  return value;
}

TEST_F(NodeTable, ACommandLineThatIsTooLongIsCutAndStillEndsWithNul) {
  kernel_.hostFacts.bootCommandLine = std::string(5000, 'c');
  getNode(kernel_, NodeIds::system_bootCmdLine, nullptr, output_.data(), 4096);
  EXPECT_EQ(std::string(output_.data()), std::string(4095, 'c'));
  EXPECT_EQ(output_[4096], 'x');
}

TEST_F(NodeTable, MemoryOfTheTopBitIsNotNegative) {
  kernel_.hostFacts.memoryKB = uint64_t{1} << 63;
  getNode(kernel_, NodeIds::memory_comprehensive, nullptr, output_.data(), 80);
  EXPECT_EQ(at<uint64_t>(output_, 0), uint64_t{1} << 63);
}

TEST_F(NodeTable, AllocationsFillTheirRecords) {
  kernel_.allocation = {1, 2, 3, 4};  // min, max, minLimit, shares
  const KNOB_ParamList instance = group();
  KNOB_MemAllocation memory;
  getNode(kernel_, NodeIds::sched_groups_memAllocationInMB, &instance, &memory, sizeof memory);
  EXPECT_EQ(memory.min, 1);
  EXPECT_EQ(memory.max, 2);
  EXPECT_EQ(memory.minLimit, 3);
  EXPECT_EQ(memory.shares, 4);
  EXPECT_EQ(memory.reserved32, 0U);
  KNOB_CpuAllocation cpu;
  getNode(kernel_, NodeIds::sched_groups_cpuAllocationInPct, &instance, &cpu, sizeof cpu);
  EXPECT_EQ(cpu.min, 1);
  EXPECT_EQ(cpu.max, 2);
  EXPECT_EQ(cpu.minLimit, 3);
  EXPECT_EQ(cpu.shares, 4);
  EXPECT_EQ(cpu.reserved16, 0U);
}

TEST_F(NodeTable, AnOutputMayBeAtAnyAddress) {
  kernel_.statistics = {123, 456};
  const KNOB_ParamList instance = group();
  getNode(kernel_, NodeIds::sched_groups_stats_memoryStats, &instance, output_.data() + 1,
          sizeof(KNOB_MemoryStats));
  const auto stats = at<KNOB_MemoryStats>(output_, 1);
  EXPECT_EQ(stats.ownReservedPeakKB, 123U);
  EXPECT_EQ(stats.childrenReservedPeakKB, 456U);
}

TEST_F(NodeTable, ArgumentsReachTheKernel) {
  const KNOB_ParamList instance = group(9);
  const KNOB_ParamList path = input({text("host/opt")});
  const KNOB_ParamList name = input({text("pool")});
  const KNOB_ParamList pid = input({int64_t{77}});
  const KNOB_ParamList settings = input({text("min=3")});
  setNode(kernel_, NodeIds::sched_groupPathNameToID, nullptr, &path, output_.data(), 8);
  EXPECT_EQ(at<int64_t>(output_, 0), 41);
  setNode(kernel_, NodeIds::sched_groups_groupCreate, &instance, &name, output_.data(), 8);
  EXPECT_EQ(at<int64_t>(output_, 0), 42);
  setNode(kernel_, NodeIds::sched_groups_delete, &instance, nullptr, nullptr, 0);
  setNode(kernel_, NodeIds::sched_groups_memAllocationInMB, &instance, &settings, nullptr, 0);
  setNode(kernel_, NodeIds::sched_groups_cpuAllocationInPct, &instance, &settings, nullptr, 0);
  setNode(kernel_, NodeIds::sched_groups_members_worlds, &instance, &pid, nullptr, 0);
  EXPECT_EQ(listNode(kernel_, NodeIds::sched_groups_members_groups, &instance),
            (std::vector<int64_t>{7, 8, 9}));
  EXPECT_EQ(kernel_.calls,
            (Calls{"lookUp host/opt", "create 9 pool", "remove 9", "set 9 memory min 3",
                   "set 9 cpu min 3", "join 9 77", "children 9"}));
}

}  // namespace
}  // namespace Knob
