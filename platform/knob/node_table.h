// SPDX-License-Identifier: Apache-2.0
// Turns one call of the interface into one call of the kernel in use. A node is a row of the table;
// nothing here knows which kernel it is, and nothing here does I/O of its own.
#pragma once

#include <array>
#include <cstddef>
#include <string_view>
#include <vector>

#include "knob/kernel.h"
#include "knob/node_list.h"
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

// What a node does. A row of the list is built from left to right:
// groupNode().sets(InputShape::kOneInt, join).lists(listMembers).
struct Node {
  using Function = void (*)(const NodeCall &);
  using ListFunction = std::vector<int64_t> (*)(Kernel &, GroupId);

  template <typename Record>
  constexpr Node gets(Function function) const {
    Node node = *this;
    node.get = function;
    node.getSize = sizeof(Record);
    return node;
  }
  constexpr Node sets(InputShape shape, Function function) const {
    Node node = *this;
    node.set = function;
    node.input = shape;
    return node;
  }
  // What a set writes into the caller's output.
  template <typename Output>
  constexpr Node returns() const {
    Node node = *this;
    node.setSize = sizeof(Output);
    return node;
  }
  constexpr Node lists(ListFunction function) const {
    Node node = *this;
    node.list = function;
    return node;
  }
  constexpr Node numbered(KNOB_NodeID number) const {
    Node node = *this;
    node.id = number;
    return node;
  }

  KNOB_NodeID id = 0;
  bool ofGroup = false;  // its instance is [group id]; otherwise it has none
  // A null function: the node does not support the call.
  Function get = nullptr;
  size_t getSize = 0;
  Function set = nullptr;
  InputShape input = InputShape::kNothing;
  size_t setSize = 0;  // 0: a set has no output
  ListFunction list = nullptr;
};

// All nodes, in the order of the list.
const std::array<Node, kNodeCount> &nodeTable();

// The calls. They throw KernelError: bad node, not supported, bad parameter, buffer size, and what
// the kernel refuses. Output is written last, when all has succeeded.
void getNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance, void *output,
             size_t outputSize);
void setNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance,
             const KNOB_ParamList *input, void *output, size_t outputSize);
std::vector<int64_t> listNode(Kernel &kernel, KNOB_NodeID id, const KNOB_ParamList *instance);

}  // namespace Knob
