/* SPDX-License-Identifier: Apache-2.0 */
/* The interface as a program in C uses it: every function and every node, once. */
#include <inttypes.h>
#include <stdio.h>

#include "platform/knob.h"
#include "platform/knob_records.h"
#include "platform/knob_status.h"

static int failures = 0;

static void expect(int good, const char *what, KNOB_ReturnStatus status) {
  if (good) return;
  (void)fprintf(stderr, "failed: %s: %s\n", what, NUC_ReturnStatusToString(status));
  ++failures;
}

static void expectSuccess(KNOB_ReturnStatus status, const char *what) {
  expect(status == 0, what, status);
}

static KNOB_ParamList *instanceOf(int64_t id) {
  KNOB_ParamList *list = KNOB_ParamListCreate(1, 1);
  expectSuccess(KNOB_ParamListAddInt(list, id), "KNOB_ParamListAddInt");
  return list;
}

static KNOB_ParamList *inputOf(const char *text) {
  KNOB_ParamList *list = KNOB_ParamListCreate(0, 1);
  expectSuccess(KNOB_ParamListAddString(list, text), "KNOB_ParamListAddString");
  return list;
}

static void readFacts(void) {
  KNOB_CpuInfo cpu;
  KNOB_VmLimits limits;
  KNOB_BootCommandLine line;
  KNOB_MemoryInfo memory;
  expectSuccess(KNOB_Get(KNOB_NODE_hardware_cpu_cpuInfo, NULL, &cpu, sizeof cpu), "cpuInfo");
  expectSuccess(KNOB_Get(KNOB_NODE_system_vmLimits, NULL, &limits, sizeof limits), "vmLimits");
  expectSuccess(KNOB_Get(KNOB_NODE_system_bootCmdLine, NULL, &line, sizeof line), "bootCmdLine");
  expectSuccess(KNOB_Get(KNOB_NODE_memory_comprehensive, NULL, &memory, sizeof memory),
                "comprehensive");
  expect(cpu.cpus > 0, "a machine with a CPU", 0);
  expect(memory.physicalKB > 0, "a machine with memory", 0);
}

static int64_t makeGroup(void) {
  int64_t parent = 0, group = 0;
  KNOB_ParamList *path = inputOf("host/opt");
  KNOB_ParamList *name = inputOf("from-c");
  KNOB_ParamList *instance;
  expectSuccess(KNOB_Set(KNOB_NODE_sched_groupPathNameToID, NULL, path, &parent, sizeof(parent)),
                "groupPathNameToID");
  instance = instanceOf(parent);
  expectSuccess(KNOB_Set(KNOB_NODE_sched_groups_groupCreate, instance, name, &group, sizeof(group)),
                "groupCreate");
  KNOB_ParamListDestroy(path);
  KNOB_ParamListDestroy(name);
  KNOB_ParamListDestroy(instance);
  return group;
}

static void useGroup(int64_t group) {
  KNOB_MemAllocation mem;
  KNOB_CpuAllocation cpu;
  KNOB_MemoryStats stats;
  KNOB_ParamList *instance = instanceOf(group);
  KNOB_ParamList *settings = inputOf("min=3");
  KNOB_ParamList *pid = KNOB_ParamListCreate(0, 1);
  expectSuccess(KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance, settings, NULL, 0),
                "set memory");
  expectSuccess(KNOB_Set(KNOB_NODE_sched_groups_cpuAllocationInPct, instance, settings, NULL, 0),
                "set CPU");
  expectSuccess(KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, instance, &mem, sizeof mem),
                "read memory");
  expect(mem.min == 3, "the memory that was set", 0);
  expectSuccess(KNOB_Get(KNOB_NODE_sched_groups_cpuAllocationInPct, instance, &cpu, sizeof cpu),
                "read CPU");
  expect(cpu.min == 3, "the CPU that was set", 0);
  expectSuccess(KNOB_Get(KNOB_NODE_sched_groups_stats_memoryStats, instance, &stats, sizeof stats),
                "memoryStats");
  expect(stats.ownReservedPeakKB == 3072, "the peak of the memory that was set", 0);
  expectSuccess(KNOB_ParamListAddInt(pid, -1), "KNOB_ParamListAddInt");
  expect(KNOB_Set(KNOB_NODE_sched_groups_members_worlds, instance, pid, NULL, 0) ==
             KNOB_STATUS_NOT_FOUND,
         "no process of that id", 0);
  KNOB_ParamListDestroy(instance);
  KNOB_ParamListDestroy(settings);
  KNOB_ParamListDestroy(pid);
}

static void listAndDelete(int64_t group) {
  KNOB_ParamList *instance = instanceOf(group);
  KNOB_ParamList *result = NULL;
  expectSuccess(KNOB_GetInstanceListAlloc(KNOB_NODE_sched_groups_members_groups, instance, &result),
                "members_groups");
  expect(KNOB_ParamListNumInstances(result) == 0, "no child groups", 0);
  KNOB_ParamListDestroy(result);
  expectSuccess(KNOB_Set(KNOB_NODE_sched_groups_delete, instance, NULL, NULL, 0), "delete");
  KNOB_ParamListDestroy(instance);
}

int main(void) {
  char running[21];
  const char *mine = NULL;
  int64_t group;
  expect(KNOB_CheckSig(running, (int)sizeof(running), &mine) == 0, "KNOB_CheckSig", 0);
  readFacts();
  group = makeGroup();
  useGroup(group);
  listAndDelete(group);
  return failures == 0 ? 0 : 1;
}
