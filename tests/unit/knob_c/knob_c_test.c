/* SPDX-License-Identifier: Apache-2.0 */
/* The interface as a program in C uses it: every function and every node, once. */
#include <inttypes.h>
#include <stdio.h>
#include <string.h>

#include "platform/knob.h"

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
  char record[4096];
  expectSuccess(KNOB_Get(KNOB_NODE_hardware_cpu_cpuInfo, NULL, record, 38), "cpuInfo");
  expectSuccess(KNOB_Get(KNOB_NODE_system_vmLimits, NULL, record, 32), "vmLimits");
  expectSuccess(KNOB_Get(KNOB_NODE_system_bootCmdLine, NULL, record, 4096), "bootCmdLine");
  expectSuccess(KNOB_Get(KNOB_NODE_memory_comprehensive, NULL, record, 80), "comprehensive");
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
  char record[382];
  int64_t min = 0;
  KNOB_ParamList *instance = instanceOf(group);
  KNOB_ParamList *settings = inputOf("min=3");
  KNOB_ParamList *pid = KNOB_ParamListCreate(0, 1);
  expectSuccess(KNOB_Set(KNOB_NODE_sched_groups_memAllocationInMB, instance, settings, NULL, 0),
                "set memory");
  expectSuccess(KNOB_Set(KNOB_NODE_sched_groups_cpuAllocationInPct, instance, settings, NULL, 0),
                "set CPU");
  expectSuccess(KNOB_Get(KNOB_NODE_sched_groups_memAllocationInMB, instance, record, 36),
                "read memory");
  memcpy(&min, record, sizeof(min));
  expect(min == 3, "the memory that was set", 0);
  expectSuccess(KNOB_Get(KNOB_NODE_sched_groups_cpuAllocationInPct, instance, record, 20),
                "read CPU");
  expectSuccess(KNOB_Get(KNOB_NODE_sched_groups_stats_memoryStats, instance, record, 382),
                "memoryStats");
  expectSuccess(KNOB_ParamListAddInt(pid, -1), "KNOB_ParamListAddInt");
  expect(KNOB_Set(KNOB_NODE_sched_groups_members_worlds, instance, pid, NULL, 0) == 0x0BAD0003,
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
