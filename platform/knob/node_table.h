// SPDX-License-Identifier: Apache-2.0
// Turns one call of the interface into one call of the kernel in use. A node is a row of the table;
// nothing here knows which kernel it is, and nothing here does I/O of its own.
#pragma once

#include <array>
#include <cstddef>
#include <string_view>
#include <vector>

#include "knob/kernel.h"
#include "platform/knob.h"

namespace Knob {

// What the list of input arguments of a node that is set must hold.
enum class InputShape { kNothing, kOneText, kOneInt, kSettings };

// The arguments of a call, checked against the node's row.
struct NodeCall {
  Kernel &kernel;
  GroupId group = 0;                       // of a node of a group
  std::string_view text;                   // kOneText
  int64_t number = 0;                      // kOneInt
  std::vector<std::string_view> settings;  // kSettings
  void *output = nullptr;                  // at least as large as the row says
};

struct Node {
  using Function = void (*)(const NodeCall &);
  using ListFunction = std::vector<int64_t> (*)(Kernel &, GroupId);

  KNOB_NodeID id;
  bool ofGroup;  // whether its instance is [group id], or nothing
  // What it does; null: the node does not support it.
  Function get;
  size_t getSize;
  Function set;
  InputShape input;
  size_t setSize;  // of the answer; 0: there is none
  ListFunction list;
};

// All nodes.
inline constexpr size_t kNodeCount = 12;
const std::array<Node, kNodeCount> &nodeTable();

// The calls. They throw KernelError: bad node, not supported, bad parameter, buffer size, and what
// the kernel refuses. Output is written last, when all has succeeded.
void getNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance, void *output,
             size_t outputSize);
void setNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance,
             const KNOB_ParamList *input, void *output, size_t outputSize);
std::vector<int64_t> listNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance);

}  // namespace Knob
