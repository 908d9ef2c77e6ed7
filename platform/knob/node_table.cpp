// SPDX-License-Identifier: Apache-2.0
// What each node does, and the checks that apply to every node.
#include "knob/node_table.h"

#include <algorithm>
#include <cstring>
#include <string>

#include "knob/allocation.h"
#include "knob/param_list.h"
#include "platform/knob_records.h"

namespace Knob {
namespace {

// A caller's buffer may have any alignment.
template <typename Record>
void write(const NodeCall &call, const Record &record) {
  std::memcpy(call.output, &record, sizeof(record));
}

void getCpuInfo(const NodeCall &call) {
  const HostFacts facts = call.kernel.facts();
  KNOB_CpuInfo record{};
  record.cpus = facts.cpus;
  record.isVm = facts.isVm ? 1 : 0;
  write(call, record);
}

void getVmLimits(const NodeCall &call) {
  KNOB_VmLimits record{};
  record.maxVms = call.kernel.facts().maxVms;
  write(call, record);
}

void getBootCommandLine(const NodeCall &call) {
  const std::string line = call.kernel.facts().bootCommandLine;
  KNOB_BootCommandLine record{};
  std::copy_n(line.begin(), std::min(line.size(), sizeof record.text - 1), record.text);
  write(call, record);
}

void getMemory(const NodeCall &call) {
  KNOB_MemoryInfo record{};
  record.physicalKB = call.kernel.facts().memoryKB;
  write(call, record);
}

void lookUp(const NodeCall &call) {
  write(call, call.kernel.lookUp(call.text));
}

void create(const NodeCall &call) {
  write(call, call.kernel.create(call.group, call.text));
}

void remove(const NodeCall &call) {
  call.kernel.remove(call.group);
}

void getMemoryAllocation(const NodeCall &call) {
  const Allocation allocation = call.kernel.readAllocation(call.group, Resource::kMemory);
  KNOB_MemAllocation record{};
  record.min = allocation.min;
  record.max = allocation.max;
  record.shares = allocation.shares;
  record.minLimit = allocation.minLimit;
  write(call, record);
}

void getCpuAllocation(const NodeCall &call) {
  const Allocation allocation = call.kernel.readAllocation(call.group, Resource::kCpu);
  KNOB_CpuAllocation record{};
  record.min = static_cast<int32_t>(allocation.min);
  record.max = static_cast<int32_t>(allocation.max);
  record.shares = static_cast<int32_t>(allocation.shares);
  record.minLimit = static_cast<int32_t>(allocation.minLimit);
  write(call, record);
}

template <Resource kResource>
void setAllocation(const NodeCall &call) {
  call.kernel.setAllocation(call.group, kResource, parseAllocationChange(kResource, call.settings));
}

void join(const NodeCall &call) {
  call.kernel.join(call.group, call.number);
}

void getMemoryStatistics(const NodeCall &call) {
  const MemoryStatistics statistics = call.kernel.memoryStatistics(call.group);
  KNOB_MemoryStats record{};
  record.ownReservedPeakKB = statistics.ownReservedPeakKB;
  record.childrenReservedPeakKB = statistics.childrenReservedPeakKB;
  write(call, record);
}

std::vector<int64_t> listGroups(Kernel &kernel, GroupId group) {
  return kernel.childGroups(group);
}

std::vector<int64_t> listMembers(Kernel &kernel, GroupId group) {
  return kernel.members(group);
}

constexpr Node machineNode() {
  return {};
}

constexpr Node groupNode() {
  Node node;
  node.ofGroup = true;
  return node;
}

#define KNOB_TABLE_ROW(name, number, node) (node).numbered(number),
constexpr std::array<Node, kNodeCount> kNodes = {KNOB_NODE_LIST(KNOB_TABLE_ROW)};
#undef KNOB_TABLE_ROW

constexpr bool hasNumberTwice() {
  for (size_t i = 0; i < kNodes.size(); ++i) {
    for (size_t j = 0; j < i; ++j) {
      if (kNodes[i].id == kNodes[j].id) return true;
    }
  }
  return false;
}

static_assert(!hasNumberTwice());

const Node &nodeOf(KNOB_NodeID id) {
  const auto node =
      std::find_if(kNodes.begin(), kNodes.end(), [id](const Node &row) { return row.id == id; });
  if (node == kNodes.end()) throw KernelError(Status::kBadNode, "number " + std::to_string(id));
  return *node;
}

void requireSupport(bool supported) {
  if (!supported) throw KernelError(Status::kNotSupported, "the node has no such call");
}

GroupId instanceOf(const Node &node, const KNOB_ParamList *instance) {
  if (node.ofGroup) return requireGroupId(instance);
  requireNoInstance(instance);
  return 0;
}

void requireOutput(const void *output, size_t size, size_t needed) {
  if (needed == 0) return;
  if (output == nullptr || size < needed) {
    throw KernelError(Status::kBufferSize, std::to_string(needed) + " bytes are needed");
  }
}

void takeInput(const Node &node, const KNOB_ParamList *input, NodeCall &call) {
  switch (node.input) {
    case InputShape::kNothing:
      return requireNoInput(input);
    case InputShape::kOneText:
      call.text = requireOneText(input);
      return;
    case InputShape::kOneInt:
      call.number = requireOneInt(input);
      return;
    case InputShape::kSettings:
      call.settings = requireTexts(input);
      return;
  }
}

}  // namespace

const std::array<Node, kNodeCount> &nodeTable() {
  return kNodes;
}

void getNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance, void *output,
             size_t outputSize) {
  const Node &node = nodeOf(id);
  requireSupport(node.get != nullptr);
  NodeCall call{kernel, instanceOf(node, instance), {}, 0, {}, output};
  requireOutput(output, outputSize, node.getSize);
  node.get(call);
}

void setNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance,
             const KNOB_ParamList *input, void *output, size_t outputSize) {
  const Node &node = nodeOf(id);
  requireSupport(node.set != nullptr);
  NodeCall call{kernel, instanceOf(node, instance), {}, 0, {}, output};
  takeInput(node, input, call);
  requireOutput(output, outputSize, node.setSize);
  node.set(call);
}

std::vector<int64_t> listNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance) {
  const Node &node = nodeOf(id);
  requireSupport(node.list != nullptr);
  return node.list(kernel, instanceOf(node, instance));
}

}  // namespace Knob
