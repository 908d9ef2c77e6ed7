// SPDX-License-Identifier: Apache-2.0
#include "knob/configuration.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <cstdlib>

#include "common/key_value_file.h"
#include "knob/session.h"
#include "temp_folder.h"

namespace Knob {
namespace {

using testing::HasSubstr;
using testing::StartsWith;

class KnobConf : public testing::Test {
 protected:
  KnobConf() : file_(folder_.path() / "knob.conf") { ::setenv("KNOB_CONF", file_.c_str(), 1); }

  void write(const std::string &text) { ::Test::writeFile(file_, text); }
  std::string refusal() {
    try {
      (void)openConfiguredKernel();
    } catch (const KernelError &error) {
      EXPECT_EQ(error.status, Status::kKernelNotUsable);
      return error.what();
    }
    return "accepted";
  }

  const ::Test::TempFolder folder_;
  const std::string file_;
};

TEST_F(KnobConf, AnEmptyFileMeansTheDefaults) {
  write("# nothing yet\n");
  const Configuration configuration = readConfiguration();
  EXPECT_EQ(configuration.kernel, Configuration::KernelKind::kEmulated);
  EXPECT_FALSE(configuration.statePath);
  EXPECT_EQ(configuration.cgroupRoot, "");
  EXPECT_EQ(configuration.maxVms, 1024U);
  EXPECT_FALSE(configuration.reserve.memoryMB);
  EXPECT_FALSE(configuration.reserve.cpuPercent);
  EXPECT_EQ(configuration.source, file_);
}

TEST_F(KnobConf, EveryKeyIsRead) {
  write(
      "kernel = linux\nstate = /x/y.db\ncgroup-root = some.slice\nmax-vms = 4294967295\n"
      "reserve-memory = 100\nreserve-cpu = 0\n");
  const Configuration configuration = readConfiguration();
  EXPECT_EQ(configuration.kernel, Configuration::KernelKind::kLinux);
  EXPECT_EQ(configuration.statePath, "/x/y.db");
  EXPECT_EQ(configuration.cgroupRoot, "some.slice");
  EXPECT_EQ(configuration.maxVms, UINT32_MAX);
  EXPECT_EQ(configuration.reserve.memoryMB, 100);
  EXPECT_EQ(configuration.reserve.cpuPercent, 0);
}

TEST_F(KnobConf, TheEmulatedKernelCanBeNamed) {
  write("kernel = emulated\n");
  EXPECT_EQ(readConfiguration().kernel, Configuration::KernelKind::kEmulated);
}

TEST_F(KnobConf, WhateverIsWrongInItMakesTheKernelUnusableWithFileAndLine) {
  const struct {
    const char *text, *reason;
  } cases[] = {{"\nkernel = real\n", ":2: kernel: bad value \"real\""},
               {"kernel\n", ":1: no '='"},
               {"kernels = linux\n", ":1: unknown key"},
               {"max-vms = -1\n", ":1: max-vms: bad value"},
               {"max-vms = 4294967296\n", ":1: max-vms: bad value"},
               {"max-vms = many\n", ":1: max-vms: bad value"},
               {"state = kernel.db\n", ":1: state: bad value"},
               {"state =\n", ":1: state: no value"},
               {"state = /a\nstate = /b\n", ":2: state: already given"}};
  for (const auto &each : cases) {
    write(each.text);
    EXPECT_THAT(refusal(), StartsWith(file_ + each.reason)) << each.text;
  }
}

TEST_F(KnobConf, AFileThatIsNamedMustExist) {
  EXPECT_THAT(refusal(), HasSubstr("no such file (named by KNOB_CONF)"));
}

TEST_F(KnobConf, AFolderIsRefused) {
  ::setenv("KNOB_CONF", folder_.path().c_str(), 1);
  EXPECT_THAT(refusal(), HasSubstr(": not a regular file"));
}

TEST_F(KnobConf, AFifoIsRefusedAndNotWaitedFor) {
  ASSERT_EQ(::mkfifo(file_.c_str(), 0600), 0);
  EXPECT_EQ(refusal(), file_ + ": not a regular file");
}

TEST_F(KnobConf, AnEmptyNameIsNoName) {
  write("max-vms = 5\n");
  ::setenv("KNOB_CONF", "", 1);
  EXPECT_NE(readConfiguration().source, file_);
}

TEST_F(KnobConf, TheLinuxKernelIsNotReplacedByTheEmulatedOne) {
  write("kernel = linux\ncgroup-root = no/such/group\nstate = " + file_ + ".db\n");
  EXPECT_NE(refusal(), "");
  EXPECT_EQ(::Test::readFile(file_ + ".db"), "");
}

TEST(ConfigurationFile, OneThatDoesNotExistIsNone) {
  EXPECT_FALSE(readConfigurationFile("/nonexistent/knob.conf"));
}

}  // namespace
}  // namespace Knob
