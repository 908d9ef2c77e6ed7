// SPDX-License-Identifier: Apache-2.0
// A libknob for tests: it records every call, returns values of a small model that a script fills,
// fails the calls that the script names, and checks the use of parameter lists. README.md in this
// folder describes its files.
#include "recording_knob.h"

#include <signal.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <fstream>
#include <iostream>
#include <memory>
#include <unordered_set>

#include "model.h"
#include "platform/knob.h"
#include "platform/knob_records.h"
#include "trace.h"

using Recording::formatted;
using Recording::quoted;

// A destroyed list is kept, so that a later use of it is noticed.
struct KNOB_ParamList {
  int number = 0;
  int kind = 0;
  int capacity = 0;
  bool destroyed = false;
  std::vector<std::string> entries;  // as in the trace: numbers plain, texts quoted
  std::vector<std::string> texts;
  std::vector<int64_t> numbers;
};

namespace {

constexpr uint32_t kBadNode = 0x0BAD00F1;

// Numbers that no other libknob is likely to have: programs must not know them.
constexpr KNOB_NodeID kFirstNode = 1001;

constexpr const char *kNodeNames[] = {"hardware_cpu_cpuInfo",
                                      "system_vmLimits",
                                      "system_bootCmdLine",
                                      "memory_comprehensive",
                                      "sched_groupPathNameToID",
                                      "sched_groups_groupCreate",
                                      "sched_groups_delete",
                                      "sched_groups_memAllocationInMB",
                                      "sched_groups_cpuAllocationInPct",
                                      "sched_groups_members_groups",
                                      "sched_groups_members_worlds",
                                      "sched_groups_stats_memoryStats"};

struct State {
  Recording::Model model;
  std::vector<std::unique_ptr<KNOB_ParamList>> lists;
  std::unordered_set<const KNOB_ParamList *> known;
  int signatureChecks = 0;
};

void write(const std::string &line) {
  Recording::record("RECORDING_KNOB_TRACE", line);
}

// Not destroyed at the end of the program, because its exit handlers may still call.
State *current = nullptr;

State &state() {
  if (current != nullptr) return *current;
  current = new State;
  const char *path = getenv("RECORDING_KNOB_SCRIPT");
  if (path == nullptr) return *current;
  std::ifstream script(path);
  try {
    current->model.read(script);
  } catch (const std::exception &e) {
    std::cerr << "recording libknob: " << e.what() << std::endl;
    abort();
  }
  return *current;
}

__attribute__((destructor)) void finish() {
  if (current == nullptr) return;  // nothing was called
  for (const auto &list : state().lists)
    if (!list->destroyed) write(formatted("MISUSE list #%d was never destroyed", list->number));
  if (const char *path = getenv("RECORDING_KNOB_GROUPS")) {
    std::ofstream groups(path);
    state().model.writeGroups(groups);
  }
  write("END");
}

std::string nodeName(KNOB_NodeID node) {
  const size_t index = static_cast<size_t>(node) - kFirstNode;
  return index < std::size(kNodeNames) ? kNodeNames[index] : "unknown";
}

std::string result(uint32_t status, bool injected) {
  const std::string text = status == 0 ? "0" : formatted("0x%08x", status);
  return " -> " + text + (injected ? " (injected)" : "");
}

// The status of the first rule that matches this call with one, or 0. Every rule counts the call,
// and sends its signal.
uint32_t injected(const char *function, const std::string &node = {},
                  const std::string &group = {}) {
  uint32_t status = 0;
  for (Recording::Rule &rule : state().model.rules) {
    if (rule.strikes(function, node, group)) {
      if (rule.signal != 0) kill(getpid(), rule.signal);
      if (status == 0) status = rule.status;
    }
  }
  return status;
}

bool isUsable(const KNOB_ParamList *list, const char *function) {
  if (state().known.count(list) == 0) {
    write(formatted("MISUSE %s of an unknown list", function));
    return false;
  }
  if (!list->destroyed) return true;
  write(formatted("MISUSE %s of the destroyed list #%d", function, list->number));
  return false;
}

std::string shown(const KNOB_ParamList *list) {
  if (list == nullptr) return "null";
  std::string text = "[";
  for (const std::string &entry : list->entries) text += (text.size() > 1 ? "," : "") + entry;
  return text + "]";
}

KNOB_ParamList *newList(int kind, int capacity) {
  auto list = std::make_unique<KNOB_ParamList>();
  list->number = static_cast<int>(state().lists.size()) + 1;
  list->kind = kind;
  list->capacity = capacity;
  state().known.insert(list.get());
  state().lists.push_back(std::move(list));
  return state().lists.back().get();
}

uint32_t add(KNOB_ParamList *list, const char *function, const std::string &entry) {
  if (!isUsable(list, function)) return Recording::kBadParameter;
  uint32_t status = injected(function);
  const bool wasInjected = status != 0;
  if (status == 0 && list->entries.size() >= static_cast<size_t>(list->capacity)) {
    write(formatted("MISUSE %s to the full list #%d", function, list->number));
    status = Recording::kBadParameter;
  }
  if (status == 0) list->entries.push_back(entry);
  write(formatted("%s #%d %s", function, list->number, entry.c_str()) +
        result(status, wasInjected));
  return status;
}

// The arguments of one KNOB_Get, KNOB_Set or KNOB_GetInstanceListAlloc.
struct Call {
  const char *function;
  KNOB_NodeID node;
  const KNOB_ParamList *instance, *input;
  void *output;
  size_t outputSize;

  Recording::Group *group() const {
    if (instance == nullptr || instance->numbers.size() != 1) return nullptr;
    return state().model.find(instance->numbers[0]);
  }

  std::string inputText() const {
    return input == nullptr || input->texts.size() != 1 ? std::string() : input->texts[0];
  }

  // The path of the group that the call is about: for a lookup or a creation, the path asked for.
  std::string groupPath() const {
    if (node == KNOB_NODE_sched_groupPathNameToID) return inputText();
    const Recording::Group *known = group();
    const std::string path = known == nullptr ? std::string() : known->path;
    return node == KNOB_NODE_sched_groups_groupCreate ? path + "/" + inputText() : path;
  }

  void checkLists() const {
    if (instance != nullptr && isUsable(instance, function) && instance->kind != 1)
      write(formatted("MISUSE list #%d is no instance list", instance->number));
    if (input != nullptr && isUsable(input, function) && input->kind != 0)
      write(formatted("MISUSE list #%d is no input list", input->number));
  }

  bool outputIs(size_t size) const {
    if (outputSize == size && (size == 0 || output != nullptr)) return true;
    write(formatted("MISUSE %s %s with %zu bytes of output", function, nodeName(node).c_str(),
                    outputSize));
    return false;
  }
};

template <typename T>
void put(const Call &call, const T &value) {
  memcpy(call.output, &value, sizeof value);
}

// Writes a record. Bytes that have no meaning get a value that a program would notice.
template <typename Record, typename SetMembers>
uint32_t putRecord(const Call &call, const SetMembers &setMembers) {
  if (!call.outputIs(sizeof(Record))) return Recording::kBadParameter;
  Record record;
  memset(&record, 0xA5, sizeof record);
  setMembers(record);
  put(call, record);
  return 0;
}

template <typename Record>
uint32_t getAllocation(const Call &call, const Recording::Allocation &allocation) {
  return putRecord<Record>(call, [&](Record &record) {
    record.min = static_cast<decltype(record.min)>(allocation.min);
    record.max = static_cast<decltype(record.max)>(allocation.max);
    record.shares = static_cast<decltype(record.shares)>(allocation.shares);
    record.minLimit = static_cast<decltype(record.minLimit)>(allocation.minLimit);
  });
}

uint32_t getFact(const Call &call) {
  const Recording::Model &model = state().model;
  if (call.node == KNOB_NODE_hardware_cpu_cpuInfo) {
    return putRecord<KNOB_CpuInfo>(call, [&](KNOB_CpuInfo &record) {
      record.cpus = model.cpus;
      record.isVm = static_cast<uint8_t>(model.isVm);
    });
  }
  if (call.node == KNOB_NODE_system_vmLimits) {
    return putRecord<KNOB_VmLimits>(call,
                                    [&](KNOB_VmLimits &record) { record.maxVms = model.maxVms; });
  }
  if (call.node == KNOB_NODE_memory_comprehensive) {
    return putRecord<KNOB_MemoryInfo>(
        call, [&](KNOB_MemoryInfo &record) { record.physicalKB = model.memoryKB; });
  }
  if (call.node == KNOB_NODE_system_bootCmdLine) {
    return putRecord<KNOB_BootCommandLine>(call, [&](KNOB_BootCommandLine &record) {
      memcpy(record.text, model.commandLine.c_str(), model.commandLine.size() + 1);
    });
  }
  return kBadNode;
}

uint32_t executeGet(const Call &call) {
  if (call.node <= KNOB_NODE_memory_comprehensive) {
    if (call.instance != nullptr) write("MISUSE a fact of the machine has no instance");
    return getFact(call);
  }
  const Recording::Group *group = call.group();
  if (group == nullptr) return Recording::kNotFound;
  if (call.node == KNOB_NODE_sched_groups_memAllocationInMB)
    return getAllocation<KNOB_MemAllocation>(call, group->memory);
  if (call.node == KNOB_NODE_sched_groups_cpuAllocationInPct)
    return getAllocation<KNOB_CpuAllocation>(call, group->cpu);
  if (call.node == KNOB_NODE_sched_groups_stats_memoryStats) {
    return putRecord<KNOB_MemoryStats>(call, [&](KNOB_MemoryStats &record) {
      record.ownReservedPeakKB = group->ownPeakKB;
      record.childrenReservedPeakKB = group->childrenPeakKB;
    });
  }
  return kBadNode;
}

uint32_t executeSet(const Call &call) {
  Recording::Model &model = state().model;
  Recording::Group *group = call.group();
  int64_t id = 0;
  if (call.node == KNOB_NODE_sched_groupPathNameToID) {
    const Recording::Group *found = model.find(call.inputText());
    if (found == nullptr) return Recording::kNotFound;
    if (!call.outputIs(sizeof id)) return Recording::kBadParameter;
    put(call, found->id);
    return 0;
  }
  if (group == nullptr) return Recording::kNotFound;
  if (call.node == KNOB_NODE_sched_groups_groupCreate) {
    if (!call.outputIs(sizeof id)) return Recording::kBadParameter;
    const uint32_t status = model.create(call.groupPath(), &id);
    if (status == 0) put(call, id);
    return status;
  }
  if (!call.outputIs(0)) return Recording::kBadParameter;
  if (call.node == KNOB_NODE_sched_groups_delete) return model.remove(group->id);
  if (call.input == nullptr) return Recording::kBadParameter;
  if (call.node == KNOB_NODE_sched_groups_memAllocationInMB)
    return Recording::apply(call.input->texts, &group->memory);
  if (call.node == KNOB_NODE_sched_groups_cpuAllocationInPct)
    return Recording::apply(call.input->texts, &group->cpu);
  return kBadNode;
}

uint32_t executed(const Call &call, uint32_t (*execute)(const Call &)) {
  call.checkLists();
  const std::string node = nodeName(call.node);
  // Before the call is executed: a deleted group has no path any more.
  uint32_t status = injected(call.function, node, call.groupPath());
  const bool wasInjected = status != 0;
  if (!wasInjected) status = execute(call);
  std::string line =
      formatted("%s %s instance=%s", call.function, node.c_str(), shown(call.instance).c_str());
  if (strcmp(call.function, "KNOB_Set") == 0) line += " input=" + shown(call.input);
  write(line + formatted(" output=%zu", call.outputSize) + result(status, wasInjected));
  return status;
}

}  // namespace

extern "C" {

void RecordingKnobEnd() {
  finish();
  delete current;
  current = nullptr;
}

const KNOB_NodeID KNOB_NODE_hardware_cpu_cpuInfo = kFirstNode;
const KNOB_NodeID KNOB_NODE_system_vmLimits = kFirstNode + 1;
const KNOB_NodeID KNOB_NODE_system_bootCmdLine = kFirstNode + 2;
const KNOB_NodeID KNOB_NODE_memory_comprehensive = kFirstNode + 3;
const KNOB_NodeID KNOB_NODE_sched_groupPathNameToID = kFirstNode + 4;
const KNOB_NodeID KNOB_NODE_sched_groups_groupCreate = kFirstNode + 5;
const KNOB_NodeID KNOB_NODE_sched_groups_delete = kFirstNode + 6;
const KNOB_NodeID KNOB_NODE_sched_groups_memAllocationInMB = kFirstNode + 7;
const KNOB_NodeID KNOB_NODE_sched_groups_cpuAllocationInPct = kFirstNode + 8;
const KNOB_NodeID KNOB_NODE_sched_groups_members_groups = kFirstNode + 9;
const KNOB_NodeID KNOB_NODE_sched_groups_members_worlds = kFirstNode + 10;
const KNOB_NodeID KNOB_NODE_sched_groups_stats_memoryStats = kFirstNode + 11;

int KNOB_CheckSig(char *runningBuild, int size, const char **myBuild) {
  const Recording::Model &model = state().model;
  const bool differs = model.mismatchFrom != 0 && ++state().signatureChecks >= model.mismatchFrom;
  write(formatted("KNOB_CheckSig size=%d -> %d", size, differs ? 1 : 0));
  if (!differs) return 0;
  snprintf(runningBuild, static_cast<size_t>(size), "%s", model.runningBuild.c_str());
  *myBuild = model.ownBuild.c_str();
  return 1;
}

KNOB_ParamList *KNOB_ParamListCreate(int kind, int capacity) {
  const std::string line = formatted("KNOB_ParamListCreate kind=%d capacity=%d", kind, capacity);
  if (injected("KNOB_ParamListCreate") != 0) {
    write(line + " -> null (injected)");
    return nullptr;
  }
  KNOB_ParamList *list = newList(kind, capacity);
  write(line + formatted(" -> #%d", list->number));
  return list;
}

KNOB_ReturnStatus KNOB_ParamListAddInt(KNOB_ParamList *list, int64_t value) {
  const uint32_t status = add(list, "KNOB_ParamListAddInt", std::to_string(value));
  if (status == 0) list->numbers.push_back(value);
  return status;
}

KNOB_ReturnStatus KNOB_ParamListAddString(KNOB_ParamList *list, const char *text) {
  const uint32_t status = add(list, "KNOB_ParamListAddString", quoted(text));
  if (status == 0) list->texts.emplace_back(text);
  return status;
}

void KNOB_ParamListDestroy(KNOB_ParamList *list) {
  if (list == nullptr) {
    write("KNOB_ParamListDestroy null");
    return;
  }
  if (!isUsable(list, "KNOB_ParamListDestroy")) return;
  list->destroyed = true;
  write(formatted("KNOB_ParamListDestroy #%d", list->number));
}

int KNOB_ParamListNumInstances(const KNOB_ParamList *list) {
  if (!isUsable(list, "KNOB_ParamListNumInstances")) return 0;
  const int count = static_cast<int>(list->entries.size());
  write(formatted("KNOB_ParamListNumInstances #%d -> %d", list->number, count));
  return count;
}

KNOB_ReturnStatus KNOB_Get(KNOB_NodeID node, const KNOB_ParamList *instance, void *output,
                           size_t outputSize) {
  return executed({"KNOB_Get", node, instance, nullptr, output, outputSize}, executeGet);
}

KNOB_ReturnStatus KNOB_Set(KNOB_NodeID node, const KNOB_ParamList *instance,
                           const KNOB_ParamList *input, void *output, size_t outputSize) {
  return executed({"KNOB_Set", node, instance, input, output, outputSize}, executeSet);
}

KNOB_ReturnStatus KNOB_GetInstanceListAlloc(KNOB_NodeID node, const KNOB_ParamList *instance,
                                            KNOB_ParamList **list) {
  const auto execute = [](const Call &call) -> uint32_t {
    Recording::Model &model = state().model;
    Recording::Group *group = call.group();
    if (group == nullptr) return Recording::kNotFound;
    std::vector<int64_t> children = model.children(*group);
    if (group->emptiesAfter == 0) {
      for (const int64_t id : children) model.remove(id);
      children.clear();
    } else if (group->emptiesAfter > 0) {
      --group->emptiesAfter;
    }
    KNOB_ParamList *made = newList(1, static_cast<int>(children.size()));
    for (const int64_t id : children) made->entries.push_back(std::to_string(id));
    *static_cast<KNOB_ParamList **>(call.output) = made;
    return 0;
  };
  const Call call{"KNOB_GetInstanceListAlloc", node, instance, nullptr, list, 0};
  const uint32_t status = executed(call, execute);
  if (status == 0) write(formatted("  handed out #%d", (*list)->number));
  return status;
}

const char *NUC_ReturnStatusToString(KNOB_ReturnStatus status) {
  static std::string text;
  write(formatted("NUC_ReturnStatusToString 0x%08x", status));
  text = formatted("status 0x%08x", status);
  return text.c_str();
}

}  // extern "C"
