// SPDX-License-Identifier: Apache-2.0
// The variables that expressions may use. They are read once in a process, so every test has one
// of its own.
#include "loader/host_facts.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <string>
#include <vector>

#include "fake_knob.h"
#include "loader/definition_files.h"
#include "loader/file_error.h"
#include "loader/resource_pool.h"
#include "own_process.h"
#include "platform/knob_status.h"
#include "temp_folder.h"
#include "yaml_support.h"

namespace {

FakeKnob &knob() {
  return FakeKnob::instance();
}

float fact(const std::string &name) {
  return Loader::hostFacts().at(name);
}

std::vector<KNOB_NodeID> nodesAsked() {
  std::vector<KNOB_NodeID> nodes;
  for (const FakeKnob::Call &call : knob().calls) nodes.push_back(call.node);
  return nodes;
}

void expectNotRead() {
  expectError<Loader::Exception>([] { Loader::hostFacts(); }, kNowhere, "KNOB_Get failed");
}

const std::vector<KNOB_NodeID> kEveryNode = {
    KNOB_NODE_hardware_cpu_cpuInfo, KNOB_NODE_system_vmLimits, KNOB_NODE_system_bootCmdLine,
    KNOB_NODE_memory_comprehensive};

TEST(HostFacts, AreSevenVariables) {
  inOwnProcess([] {
    knob().isVm = 1;
    const Calc::VariableTable expected = {{"numPCPUs", 8.0f},
                                          {"maxVMs", 1024.0f},
                                          {"isInstaller", 0.0f},
                                          {"isVm", 1.0f},
                                          {"physKB", 16777216.0f},
                                          {"nucdefs.nux86_debug", 0.0f},
                                          {"nucdefs.GCOV_NUCLEUS", 0.0f}};
    EXPECT_EQ(expected, Loader::hostFacts());
  });
}

TEST(HostFacts, IgnoreTheOtherBytesOfTheRecords) {
  inOwnProcess([] {
    knob().filler = '\x5a';
    knob().physicalCpus = 3;
    EXPECT_EQ(3.0f, fact("numPCPUs"));
    EXPECT_EQ(0.0f, fact("isVm"));
    EXPECT_EQ(1024.0f, fact("maxVMs"));
    EXPECT_EQ(16777216.0f, fact("physKB"));
    EXPECT_EQ(0.0f, fact("nucdefs.nux86_debug"));
    EXPECT_EQ(0.0f, fact("nucdefs.GCOV_NUCLEUS"));
  });
}

TEST(HostFacts, AskEachNodeOnceInOrderWithItsSizeAndNoInstance) {
  inOwnProcess([] {
    Loader::hostFacts();
    EXPECT_EQ(kEveryNode, nodesAsked());
    const size_t sizes[] = {38, 32, 4096, 80};
    for (size_t i = 0; i < 4; ++i) {
      EXPECT_EQ(sizes[i], knob().calls.at(i).outputSize);
      EXPECT_FALSE(knob().calls.at(i).hasInstance);
    }
  });
}

TEST(HostFacts, AreReadOnceInAProcess) {
  inOwnProcess([] {
    const Calc::VariableTable &first = Loader::hostFacts();
    knob().physicalCpus = 99;
    Loader::ResourcePoolImpl pool(yaml("{name: a, memMin: !calc numPCPUs}"));
    EXPECT_EQ(8, int64_t{pool.mem.min});
    EXPECT_EQ(&first, &Loader::hostFacts());
    EXPECT_EQ(4u, knob().calls.size());
  });
}

TEST(HostFacts, AnUnusableKernelIsTheNestedCause) {
  inOwnProcess([] {
    knob().failures[KNOB_NODE_system_vmLimits] = KNOB_STATUS_KERNEL_NOT_USABLE;
    expectNotRead();
    try {
      Loader::hostFacts();
    } catch (const Loader::Exception &error) {
      EXPECT_THROW(std::rethrow_if_nested(error), Loader::KernelNotUsable);
    }
  });
}

TEST(HostFacts, OtherFailuresHaveNoNestedCause) {
  inOwnProcess([] {
    knob().failures[KNOB_NODE_system_vmLimits] = KNOB_STATUS_FAILURE;
    try {
      Loader::hostFacts();
      FAIL() << "nothing was thrown";
    } catch (const Loader::Exception &error) {
      EXPECT_NO_THROW(std::rethrow_if_nested(error));
    }
  });
}

TEST(HostFacts, AreUnsigned) {
  inOwnProcess([] {
    knob().physicalCpus = 0xFFFFFFFF;
    knob().maxVMs = 0x80000000;
    knob().isVm = 0xFF;
    EXPECT_EQ(4294967296.0f, fact("numPCPUs"));
    EXPECT_EQ(2147483648.0f, fact("maxVMs"));
    EXPECT_EQ(255.0f, fact("isVm"));
  });
}

TEST(HostFacts, MemoryWithTheTopBitSetIsPositive) {
  inOwnProcess([] {
    knob().physKB = 1ULL << 63;
    EXPECT_EQ(0x1p63f, fact("physKB"));
  });
  inOwnProcess([] {
    knob().physKB = std::numeric_limits<uint64_t>::max();
    EXPECT_EQ(0x1p64f, fact("physKB"));
  });
}

TEST(HostFacts, MemoryIsTheNearestFloat) {
  inOwnProcess([] {
    knob().physKB = 16777217;
    EXPECT_EQ(16777216.0f, fact("physKB"));
  });
  inOwnProcess([] {
    knob().physKB = (1ULL << 63) + (1ULL << 39) + 1;  // just above the middle of two floats
    EXPECT_EQ(0x1.000002p63f, fact("physKB"));
  });
}

TEST(HostFacts, InstallerWordCountsAnywhere) {
  for (const char *line :
       {"runotter", "quiet runotter", "runotter=1 quiet", "xrunotterx", "arunotter"}) {
    inOwnProcess([line] {
      knob().commandLine = line;
      EXPECT_EQ(1.0f, fact("isInstaller")) << line;
    });
  }
}

TEST(HostFacts, OtherCommandLinesAreNoInstaller) {
  for (const char *line : {"", "quiet", "RUNOTTER", "Runotter", "runotte", "run otter"}) {
    inOwnProcess([line] {
      knob().commandLine = line;
      EXPECT_EQ(0.0f, fact("isInstaller")) << line;
    });
  }
}

TEST(HostFacts, CommandLineEndsAtItsFirstNul) {
  inOwnProcess([] {
    knob().commandLine = std::string("quiet\0runotter", 14);
    EXPECT_EQ(0.0f, fact("isInstaller"));
  });
}

TEST(HostFacts, CommandLineMayFillItsRecord) {
  inOwnProcess([] {
    knob().commandLine = std::string(4088, 'x') + "runotter";
    knob().terminated = false;
    EXPECT_EQ(1.0f, fact("isInstaller"));
  });
  inOwnProcess([] {
    knob().commandLine = std::string(4096, 'x');
    knob().terminated = false;
    EXPECT_EQ(0.0f, fact("isInstaller"));
  });
}

TEST(HostFacts, EachFailingReadIsReportedWithoutItsStatus) {
  for (const KNOB_NodeID node : kEveryNode) {
    inOwnProcess([node] {
      knob().failures[node] = 0x0BAD0001;
      expectNotRead();
      EXPECT_EQ(node, nodesAsked().back());
    });
  }
}

TEST(HostFacts, RecordsThatWereReadAreNotReadAgainAfterAFailure) {
  for (size_t failing = 0; failing < kEveryNode.size(); ++failing) {
    inOwnProcess([failing] {
      const KNOB_NodeID node = kEveryNode[failing];
      knob().failures[node] = 1;
      expectNotRead();
      expectNotRead();
      knob().failures.clear();
      EXPECT_EQ(8.0f, fact("numPCPUs"));
      std::vector<KNOB_NodeID> expected = kEveryNode;
      expected.insert(expected.begin() + static_cast<std::ptrdiff_t>(failing), 2, node);
      EXPECT_EQ(expected, nodesAsked());
    });
  }
}

TEST(HostFacts, NextPoolRetriesTheLimitsButNotTheCpus) {
  inOwnProcess([] {
    knob().failures[KNOB_NODE_system_vmLimits] = 1;
    EXPECT_THROW(Loader::ResourcePoolImpl(yaml("{name: a}")), Loader::Exception);
    knob().failures.clear();
    knob().calls.clear();
    EXPECT_EQ("host/opt/a", Loader::ResourcePoolImpl(yaml("{name: a}")).name);
    EXPECT_EQ(std::vector<KNOB_NodeID>(kEveryNode.begin() + 1, kEveryNode.end()), nodesAsked());
  });
}

TEST(HostFacts, FailureComesBeforeAnythingInTheItem) {
  inOwnProcess([] {
    knob().failures[KNOB_NODE_hardware_cpu_cpuInfo] = 1;
    for (const YAML::Node &item : {yaml("{name: a}"), yaml("scalar"), invalidNode()}) {
      expectError<Loader::Exception>([&] { Loader::ResourcePoolImpl pool(item); }, kNowhere,
                                     "KNOB_Get failed");
    }
  });
}

TEST(HostFacts, FileWithoutPoolsNeverAsksTheKernel) {
  const ::Test::TempFolder folder;
  const std::string path = folder.path() / "empty";
  for (const char *content : {"", "~", "scalar", "[]", "{}"}) {
    ::Test::writeFile(path, content);
    inOwnProcess([&] {
      EXPECT_TRUE(Loader::readFile(path).empty());
      EXPECT_TRUE(knob().calls.empty()) << content;
    });
  }
}

TEST(HostFacts, FailureNamesTheFileThatIsRead) {
  const ::Test::TempFolder folder;
  const std::string path = folder.path() / "pools";
  ::Test::writeFile(path, "- name: a\n");
  inOwnProcess([&] {
    knob().failures[KNOB_NODE_memory_comprehensive] = 1;
    try {
      Loader::readFile(path);
      ADD_FAILURE() << "a kernel that does not answer was overlooked";
    } catch (const Loader::FileError &error) {
      EXPECT_EQ(path + ": KNOB_Get failed", error.what());
      EXPECT_THROW(std::rethrow_if_nested(error), Loader::Exception);
    }
  });
}

}  // namespace
