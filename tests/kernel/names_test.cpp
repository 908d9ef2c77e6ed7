// SPDX-License-Identifier: Apache-2.0
// Which names a group can have: a bad one is a bad parameter in a create, and not found in a
// lookup.
#include "contract_test.h"

namespace Contract {
namespace {

class BadName : public ContractTest, public testing::WithParamInterface<std::string> {};

TEST_P(BadName, IsABadParameterInACreateAndNotFoundInALookup) {
  const int64_t parent = idOf("host/opt");
  EXPECT_EQ(create(parent, GetParam()).status, kBadParameter);
  EXPECT_EQ(countChildGroups(parent).value, 0);
  EXPECT_EQ(lookUp("host/opt/" + GetParam()).status, kNotFound);
}

TEST_P(BadName, IsNotFoundInTheMiddleOfAPathThatLeadsBackIntoTheTree) {
  newGroup("host/opt", "pool");
  EXPECT_EQ(lookUp("host/" + GetParam() + "/opt/pool").status, kNotFound);
  EXPECT_EQ(lookUp("host/opt/" + GetParam() + "/pool").status, kNotFound);
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, BadName,
                         testing::Values("", ".", "..", "a/b", "/", "/a", "a/", "a\nb", "\n",
                                         std::string(256, 'n'), std::string(5000, 'n')));
INSTANTIATE_TEST_SUITE_P(LikeAControlFile, BadName,
                         testing::Values("cgroup.procs", "cgroup.", "memory.min", "memory.",
                                         "cpu.max", "cpu.", "cpuset.cpus", "io.max", "pids.max",
                                         "hugetlb.2MB.max", "rdma.max", "misc.max", "irq.pressure",
                                         "perf_event.x", "debug.x", "dmem.max"));

class GoodName : public ContractTest, public testing::WithParamInterface<std::string> {};

TEST_P(GoodName, NamesAGroup) {
  const int64_t id = newGroup("host/opt", GetParam());
  EXPECT_EQ(idOf("host/opt/" + GetParam()), id);
}

INSTANTIATE_TEST_SUITE_P(OfEveryKind, GoodName,
                         testing::Values("a", "...", ".a", "a.", "..a", std::string(255, 'n'),
                                         "memory", "memory-min", "xmemory.min", "Memory.min",
                                         "cpus.max", "cgroups.procs", "min=1", " ", "a b",
                                         "\xc3\xa9", "\xff", "'", "\"", "--", "%s"));

using Paths = ContractTest;

TEST_F(Paths, AnEmptyPathIsNotFound) {
  EXPECT_EQ(lookUp("").status, kNotFound);
}

TEST_F(Paths, ASlashTooManyIsNotFound) {
  for (const char *path : {"/", "/host", "host/", "host//opt", "host/opt/", "//host/opt"}) {
    EXPECT_EQ(lookUp(path).status, kNotFound) << path;
  }
}

TEST_F(Paths, NoPathLeadsUpwards) {
  newGroup("host/opt", "pool");
  for (const char *path : {"host/opt/..", "host/opt/../opt", "host/./opt", "host/opt/pool/.",
                           "../host", "./host", "host/../../etc", "..", "."}) {
    EXPECT_EQ(lookUp(path).status, kNotFound) << path;
  }
}

TEST_F(Paths, AVeryLongPathIsNotFound) {
  std::string path = "host";
  for (int i = 0; i < 20000; ++i) path += "/opt";
  EXPECT_EQ(lookUp(path).status, kNotFound);
}

}  // namespace
}  // namespace Contract
