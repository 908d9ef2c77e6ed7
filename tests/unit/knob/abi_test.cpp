// SPDX-License-Identifier: Apache-2.0
// The C functions: null and small buffers, one wrapper for what is thrown, and what they return
// without memory. Built with the library's own objects, so that allocations can be made to fail.
#include <gtest/gtest.h>

#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <functional>
#include <new>

#include "common/sqlite.h"
#include "knob/live_kernel.h"
#include "knob/signature.h"
#include "knob/status.h"
#include "platform/knob.h"
#include "platform/knob_status.h"
#include "sqlite_memory_limit.h"
#include "temp_folder.h"

namespace {

// The allocation that fails, counted down; negative: none does.
thread_local int allocationsLeft = -1;

}  // namespace

void *operator new(size_t size) {
  if (allocationsLeft == 0) throw std::bad_alloc();
  if (allocationsLeft > 0) --allocationsLeft;
  if (void *memory = std::malloc(size == 0 ? 1 : size)) return memory;
  throw std::bad_alloc();
}

void *operator new(size_t size, const std::nothrow_t &) noexcept {
  if (allocationsLeft == 0) return nullptr;
  if (allocationsLeft > 0) --allocationsLeft;
  return std::malloc(size == 0 ? 1 : size);
}

// Inlined beside a call of operator new, a free() would look like the wrong partner of it.
[[gnu::noinline]] void operator delete(void *memory) noexcept {
  std::free(memory);
}

[[gnu::noinline]] void operator delete(void *memory, size_t) noexcept {
  std::free(memory);
}

namespace Knob {
namespace {

constexpr KNOB_ReturnStatus number(Status status) {
  return static_cast<uint32_t>(status);
}

class Abi : public testing::Test {
 protected:
  Abi() {
    ::Test::writeFile(conf_, "state = " + state_ + "\n");
    ::setenv("KNOB_CONF", conf_.c_str(), 1);
    LiveKernel::instance().close();
  }
  ~Abi() override {
    LiveKernel::instance().close();
    KNOB_ParamListDestroy(instance_);
    KNOB_ParamListDestroy(path_);
    KNOB_ParamListDestroy(settings_);
  }

  static KNOB_ParamList *textList(const char *text) {
    KNOB_ParamList *list = KNOB_ParamListCreate(0, 1);
    EXPECT_EQ(KNOB_ParamListAddString(list, text), 0U);
    return list;
  }
  static KNOB_ParamList *idList(int64_t id) {
    KNOB_ParamList *list = KNOB_ParamListCreate(1, 1);
    EXPECT_EQ(KNOB_ParamListAddInt(list, id), 0U);
    return list;
  }
  KNOB_ReturnStatus lookUp(int64_t *id) {
    return KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, path_, id, sizeof(*id));
  }

  const ::Test::TempFolder folder_;
  const std::string conf_ = folder_.path() / "knob.conf";
  const std::string state_ = folder_.path() / "kernel.db";
  KNOB_ParamList *instance_ = idList(2);  // host/opt
  KNOB_ParamList *path_ = textList("host/opt");
  KNOB_ParamList *settings_ = textList("min=1");
};

TEST_F(Abi, AListTakesAsManyEntriesAsItsCapacity) {
  KNOB_ParamList *list = KNOB_ParamListCreate(0, 2);
  EXPECT_EQ(KNOB_ParamListNumInstances(list), 0);
  EXPECT_EQ(KNOB_ParamListAddInt(list, 1), 0U);
  EXPECT_EQ(KNOB_ParamListAddString(list, "text"), 0U);
  EXPECT_EQ(KNOB_ParamListAddInt(list, 3), number(Status::kBadParameter));
  EXPECT_EQ(KNOB_ParamListAddString(list, "more"), number(Status::kBadParameter));
  EXPECT_EQ(KNOB_ParamListNumInstances(list), 2);
  KNOB_ParamListDestroy(list);
}

TEST_F(Abi, AListOfAnUnknownKindOrSizeIsNotMade) {
  EXPECT_EQ(KNOB_ParamListCreate(2, 1), nullptr);
  EXPECT_EQ(KNOB_ParamListCreate(-1, 1), nullptr);
  EXPECT_EQ(KNOB_ParamListCreate(0, -1), nullptr);
  KNOB_ParamList *none = KNOB_ParamListCreate(1, 0);
  ASSERT_NE(none, nullptr);
  EXPECT_EQ(KNOB_ParamListAddInt(none, 1), number(Status::kBadParameter));
  KNOB_ParamListDestroy(none);
  KNOB_ParamList *large = KNOB_ParamListCreate(1, INT32_MAX);
  ASSERT_NE(large, nullptr) << "room is made when it is needed";
  KNOB_ParamListDestroy(large);
}

TEST_F(Abi, NullIsAStatusOrNothing) {
  EXPECT_EQ(KNOB_ParamListAddInt(nullptr, 1), number(Status::kBadParameter));
  EXPECT_EQ(KNOB_ParamListAddString(nullptr, "x"), number(Status::kBadParameter));
  EXPECT_EQ(KNOB_ParamListAddString(path_, nullptr), number(Status::kBadParameter));
  EXPECT_EQ(KNOB_ParamListNumInstances(nullptr), 0);
  KNOB_ParamListDestroy(nullptr);
  EXPECT_EQ(KNOB_Get(KNOB_NODE_hardware_cpu_cpuInfo, nullptr, nullptr, 38),
            number(Status::kBufferSize));
  EXPECT_EQ(KNOB_Set(KNOB_NODE_sched_groups_delete, nullptr, nullptr, nullptr, 0),
            number(Status::kBadParameter));
  EXPECT_EQ(KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, instance_, nullptr),
            number(Status::kBufferSize));
}

TEST_F(Abi, AListCopiesItsTexts) {
  char text[] = "host/opt";
  KNOB_ParamList *list = textList(text);
  std::memset(text, 'x', sizeof(text) - 1);
  int64_t id = 0;
  EXPECT_EQ(KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, list, &id, sizeof(id)), 0U);
  KNOB_ParamListDestroy(list);
}

TEST_F(Abi, AnInstanceListIsTheCallersToDestroy) {
  KNOB_ParamList *hosts = idList(1);
  KNOB_ParamList *result = nullptr;
  EXPECT_EQ(KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, hosts, &result), 0U);
  EXPECT_EQ(KNOB_ParamListNumInstances(result), 1);
  EXPECT_EQ(KNOB_ParamListAddInt(result, 1), number(Status::kBadParameter)) << "it is full";
  // It is a list of instances like any other.
  KNOB_ParamList *below = nullptr;
  EXPECT_EQ(KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, result, &below), 0U);
  EXPECT_EQ(KNOB_ParamListNumInstances(below), 0);
  for (KNOB_ParamList *list : {hosts, result, below}) KNOB_ParamListDestroy(list);
}

TEST_F(Abi, AFailedInstanceListLeavesTheResultUntouched) {
  KNOB_ParamList *gone = idList(999);
  KNOB_ParamList *result = settings_;
  EXPECT_EQ(KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, gone, &result),
            number(Status::kNotFound));
  EXPECT_EQ(result, settings_);
  KNOB_ParamListDestroy(gone);
}

TEST_F(Abi, NodesHaveNumbersOfTheirOwn) {
  EXPECT_NE(KNOB_NODE_system_vmLimits, KNOB_NODE_system_bootCmdLine);
  EXPECT_EQ(KNOB_Get(0, nullptr, nullptr, 0), number(Status::kBadNode));
  EXPECT_EQ(KNOB_Get(0xffff, nullptr, nullptr, 0), number(Status::kBadNode));
}

class Reasons : public Abi {
 protected:
  static std::string textOf(KNOB_ReturnStatus status) { return NUC_ReturnStatusToString(status); }

  KNOB_ReturnStatus lookUp(const char *path) {
    KNOB_ParamList *list = textList(path);
    int64_t id = 0;
    const KNOB_ReturnStatus status =
        KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, list, &id, sizeof(id));
    KNOB_ParamListDestroy(list);
    return status;
  }
  KNOB_ReturnStatus setMemory(std::initializer_list<const char *> settings) {
    KNOB_ParamList *list = KNOB_ParamListCreate(0, static_cast<int>(settings.size()));
    for (const char *setting : settings) EXPECT_EQ(KNOB_ParamListAddString(list, setting), 0U);
    const KNOB_ReturnStatus status =
        KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance_, list, nullptr, 0);
    KNOB_ParamListDestroy(list);
    return status;
  }
};

TEST_F(Reasons, AMissingGroupIsNamedAsFarAsThePathIsWrong) {
  EXPECT_EQ(textOf(lookUp("host/opt/no")), "not found: host/opt/no");
  EXPECT_EQ(textOf(lookUp("host/no/below")), "not found: host/no");
  EXPECT_EQ(textOf(lookUp("other")), "not found: other");
}

TEST_F(Reasons, ABadSettingIsNamedWithItsValues) {
  EXPECT_EQ(textOf(setMemory({"min=300", "max=200"})), "bad parameter: min 300 is above max 200");
  EXPECT_EQ(textOf(setMemory({"max=-7"})), "bad parameter: max -7 is negative");
  EXPECT_EQ(textOf(setMemory({"min=x"})),
            "bad parameter: \"min=x\": not a decimal number of 64 bits");
}

TEST_F(Reasons, AnUndoThatSucceedsKeepsTheReason) {
  const KNOB_ReturnStatus status = lookUp("host/opt/no");
  ASSERT_EQ(lookUp("host/opt"), 0U);
  EXPECT_EQ(textOf(status), "not found: host/opt/no");
}

TEST_F(Reasons, ALaterFailureReplacesTheReason) {
  const KNOB_ReturnStatus status = lookUp("host/opt/no");
  EXPECT_EQ(setMemory({"max=-7"}), number(Status::kBadParameter));
  EXPECT_EQ(textOf(status), "not found");
  KNOB_ParamList *list = KNOB_ParamListCreate(0, 0);
  EXPECT_EQ(textOf(KNOB_ParamListAddInt(list, 1)), "bad parameter: the list is full");
  KNOB_ParamListDestroy(list);
}

TEST_F(Reasons, AListThatIsNotMadeHasNoReasonOfAnEarlierCall) {
  const KNOB_ReturnStatus status = lookUp("host/opt/no");
  EXPECT_EQ(KNOB_ParamListCreate(7, 1), nullptr);
  EXPECT_EQ(textOf(status), "not found");
}

TEST_F(Reasons, DestroyingAListKeepsTheReason) {
  KNOB_ParamList *list = idList(1);
  const KNOB_ReturnStatus status = lookUp("host/opt/no");
  KNOB_ParamListDestroy(list);
  EXPECT_EQ(textOf(status), "not found: host/opt/no");
}

TEST_F(Reasons, ASignatureCheckLeavesNoReason) {
  ::Test::writeFile(conf_, "kernel = good\n");
  EXPECT_EQ(KNOB_CheckSig(nullptr, 0, nullptr), 0);
  EXPECT_EQ(textOf(KNOB_STATUS_KERNEL_NOT_USABLE), "kernel not usable (see `knobctl status`)");
}

TEST_F(Reasons, ABadConfigurationIsNamedWithFileAndLine) {
  ::Test::writeFile(conf_, "\nkernel = good\n");
  EXPECT_EQ(textOf(lookUp("host")), "kernel not usable (see `knobctl status`): " + conf_ +
                                        ":2: kernel: bad value \"good\" (one of: emulated, linux)");
}

TEST_F(Reasons, WithoutMemoryTheStatusHasItsOwnText) {
  const std::string name(300, 'x');
  KNOB_ParamList *list = textList(name.c_str());
  int64_t id = 0;
  for (int nth = 0; nth < 50; ++nth) {
    allocationsLeft = nth;
    const KNOB_ReturnStatus status =
        KNOB_Set(KNOB_NODE_sched_groupPathNameToID, nullptr, list, &id, sizeof(id));
    allocationsLeft = -1;
    const std::string text = textOf(status);
    EXPECT_TRUE(text == "out of memory" || text == "not found" || text == "not found: " + name)
        << text;
  }
  KNOB_ParamListDestroy(list);
}

class Signature : public Abi {
 protected:
  // Boots a kernel and changes what it keeps of its library.
  void bootBy(const char *change) {
    int64_t id = 0;
    ASSERT_EQ(lookUp(&id), 0U);
    LiveKernel::instance().close();
    Platform::Database(state_, Platform::Database::Mode::kReadWrite, 0)
        .execute((std::string("UPDATE kernel SET ") + change).c_str());
    ASSERT_TRUE(std::filesystem::remove(state_ + "-facts"));
  }
  void bootByAnotherInterface() { bootBy("md5 = 'other', build_date = 'Jan  1 2001 01:02:03'"); }
};

TEST_F(Signature, TheSameBuildMatches) {
  char running[21] = "untouched";
  const char *mine = nullptr;
  EXPECT_EQ(KNOB_CheckSig(running, sizeof(running), &mine), 0);
  EXPECT_STREQ(running, "untouched");
  EXPECT_EQ(mine, nullptr);
}

TEST_F(Signature, AnotherBuildDateAloneMatches) {
  bootBy("build_date = 'Jan  1 2001 01:02:03'");
  char running[21] = "untouched";
  const char *mine = nullptr;
  EXPECT_EQ(KNOB_CheckSig(running, sizeof(running), &mine), 0);
  EXPECT_STREQ(running, "untouched");
}

TEST_F(Signature, AnotherInterfaceIsAMismatchWithBothDates) {
  bootByAnotherInterface();
  char running[21];
  const char *mine = nullptr;
  EXPECT_NE(KNOB_CheckSig(running, sizeof(running), &mine), 0);
  EXPECT_STREQ(running, "Jan  1 2001 01:02:03");
  EXPECT_STREQ(mine, buildDate());
}

TEST_F(Signature, ASmallBufferGetsWhatFits) {
  bootByAnotherInterface();
  char running[] = "xxxxxxxx";
  const char *mine = nullptr;
  EXPECT_NE(KNOB_CheckSig(running, 4, &mine), 0);
  EXPECT_STREQ(running, "Jan");
  EXPECT_EQ(running[4], 'x');
}

TEST_F(Signature, NullBuffersAreAllowed) {
  bootByAnotherInterface();
  char running[] = "x";
  EXPECT_NE(KNOB_CheckSig(nullptr, 21, nullptr), 0);
  EXPECT_NE(KNOB_CheckSig(running, 0, nullptr), 0);
  EXPECT_NE(KNOB_CheckSig(running, -1, nullptr), 0);
  EXPECT_STREQ(running, "x");
}

using NotUsable = Abi;

TEST_F(NotUsable, ABadConfigurationIsTheAnswerOfEveryCall) {
  ::Test::writeFile(conf_, "kernel = good\n");
  const auto expected = number(Status::kKernelNotUsable);
  char output[4096];
  int64_t id = -1;
  KNOB_ParamList *result = nullptr;
  EXPECT_EQ(KNOB_Get(KNOB_NODE_hardware_cpu_cpuInfo, nullptr, output, sizeof(output)), expected);
  EXPECT_EQ(KNOB_Get(0xffff, nullptr, nullptr, 0), expected);
  EXPECT_EQ(lookUp(&id), expected);
  EXPECT_EQ(id, -1);
  EXPECT_EQ(KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, instance_, &result),
            expected);
  EXPECT_EQ(KNOB_CheckSig(output, 21, nullptr), 0) << "no mismatch is known";
}

TEST_F(NotUsable, TheNextCallLooksAfresh) {
  ::Test::writeFile(conf_, "kernel = good\n");
  int64_t id = -1;
  ASSERT_EQ(lookUp(&id), number(Status::kKernelNotUsable));
  ::Test::writeFile(conf_, "state = " + state_ + "\n");
  EXPECT_EQ(lookUp(&id), 0U);
}

TEST_F(NotUsable, AStateThatIsDamagedWhileItIsOpenIsLetGo) {
  int64_t id = -1;
  ASSERT_EQ(lookUp(&id), 0U);
  Platform::Database(state_, Platform::Database::Mode::kReadWrite, 0).execute("DELETE FROM kernel");
  char output[38];
  EXPECT_EQ(KNOB_Get(KNOB_NODE_hardware_cpu_cpuInfo, nullptr, output, sizeof(output)),
            number(Status::kKernelNotUsable));
  EXPECT_EQ(lookUp(&id), number(Status::kKernelNotUsable));
}

// Runs a call with its first allocation failing, then its second, and so on until it succeeds.
void expectOutOfMemoryUntilDone(
    const std::function<KNOB_ReturnStatus()> &call,
    const std::function<void()> &afterFailure = [] {}) {
  constexpr int kMax = 500;
  for (int nth = 0; nth < kMax; ++nth) {
    allocationsLeft = nth;
    const KNOB_ReturnStatus status = call();
    allocationsLeft = -1;
    if (status == 0) {
      EXPECT_GT(nth, 0) << "nothing was made to fail";
      return;
    }
    ASSERT_EQ(status, number(Status::kOutOfMemory)) << nth;
    afterFailure();
  }
  FAIL() << "never succeeded";
}

class OutOfMemory : public Abi {
 protected:
  int childrenOfOpt() {
    KNOB_ParamList *result = nullptr;
    EXPECT_EQ(KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, instance_, &result),
              0U);
    const int count = KNOB_ParamListNumInstances(result);
    KNOB_ParamListDestroy(result);
    return count;
  }
};

TEST_F(OutOfMemory, AListIsNull) {
  allocationsLeft = 0;
  KNOB_ParamList *list = KNOB_ParamListCreate(0, 1);
  allocationsLeft = -1;
  EXPECT_EQ(list, nullptr);
}

TEST_F(OutOfMemory, AnEntryIsNotAdded) {
  KNOB_ParamList *list = KNOB_ParamListCreate(0, 1);
  const std::string text(100, 'x');
  expectOutOfMemoryUntilDone([&] { return KNOB_ParamListAddString(list, text.c_str()); },
                             [&] { EXPECT_EQ(KNOB_ParamListNumInstances(list), 0); });
  EXPECT_EQ(KNOB_ParamListNumInstances(list), 1);
  KNOB_ParamListDestroy(list);
}

TEST_F(OutOfMemory, TheFirstUseCanBeTriedAgain) {
  int64_t id = -1;
  expectOutOfMemoryUntilDone([&] { return lookUp(&id); }, [&] { EXPECT_EQ(id, -1); });
  EXPECT_EQ(id, 2);
}

TEST_F(OutOfMemory, OpeningAStateCanBeTriedAgain) {
  int64_t id = -1;
  ASSERT_EQ(lookUp(&id), 0U);
  LiveKernel::instance().close();
  expectOutOfMemoryUntilDone([&] { return lookUp(&id); });
}

TEST_F(OutOfMemory, NoGroupIsMade) {
  KNOB_ParamList *name = textList("a name that no short text of a library can hold");
  int64_t id = -1;
  ASSERT_EQ(childrenOfOpt(), 0);
  expectOutOfMemoryUntilDone(
      [&] {
        LiveKernel::instance().close();
        return KNOB_Set(KNOB_NODE_sched_groups_groupCreate, instance_, name, &id, sizeof(id));
      },
      [&] { EXPECT_EQ(childrenOfOpt(), 0); });
  EXPECT_EQ(childrenOfOpt(), 1);
  KNOB_ParamListDestroy(name);
}

TEST_F(OutOfMemory, NoGroupIsMadeWhenSqliteHasNoMemory) {
  KNOB_ParamList *name = textList("pool");
  int64_t id = -1;
  int failures = 0;
  for (int moreBytes = 0;; moreBytes += 1000) {
    ASSERT_LT(moreBytes, 1000000) << "never succeeded";
    ASSERT_EQ(childrenOfOpt(), 0);  // opens the state, and works after every failure
    KNOB_ReturnStatus status = 0;
    {
      const ::Test::SqliteMemoryLimit limit(moreBytes);
      status = KNOB_Set(KNOB_NODE_sched_groups_groupCreate, instance_, name, &id, sizeof(id));
    }
    if (status == 0) break;
    ASSERT_EQ(status, number(Status::kOutOfMemory)) << moreBytes;
    LiveKernel::instance().close();
    ++failures;
  }
  EXPECT_GT(failures, 0);
  EXPECT_EQ(childrenOfOpt(), 1);
  KNOB_ParamListDestroy(name);
}

TEST_F(OutOfMemory, NoAllocationIsChanged) {
  char record[36] = {};
  const auto min = [&] {
    EXPECT_EQ(KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, instance_, record, 36), 0U);
    return record[0];
  };
  ASSERT_EQ(min(), 0);
  expectOutOfMemoryUntilDone(
      [&] {
        return KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance_, settings_, nullptr, 0);
      },
      [&] { EXPECT_EQ(min(), 0); });
  EXPECT_EQ(min(), 1);
}

TEST_F(OutOfMemory, NoInstanceListIsHandedOut) {
  KNOB_ParamList *hosts = idList(1);
  KNOB_ParamList *result = nullptr;
  expectOutOfMemoryUntilDone(
      [&] {
        return KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, hosts, &result);
      },
      [&] { EXPECT_EQ(result, nullptr); });
  EXPECT_EQ(KNOB_ParamListNumInstances(result), 1);
  KNOB_ParamListDestroy(result);
  KNOB_ParamListDestroy(hosts);
}

TEST_F(OutOfMemory, AProcessJoinsOrDoesNot) {
  int64_t id = -1;
  ASSERT_EQ(lookUp(&id), 0U);
  KNOB_ParamList *pids = KNOB_ParamListCreate(0, 1);
  ASSERT_EQ(KNOB_ParamListAddInt(pids, ::getpid()), 0U);
  expectOutOfMemoryUntilDone(
      [&] { return KNOB_Set(KNOB_NODE_sched_groups_members_worlds, instance_, pids, nullptr, 0); });
  KNOB_ParamListDestroy(pids);
}

}  // namespace
}  // namespace Knob
