// SPDX-License-Identifier: Apache-2.0
// The C functions of the interface, and the only symbols that the library exports. No exception
// leaves them.
#include <cstdio>
#include <exception>
#include <memory>
#include <new>
#include <string>
#include <type_traits>
#include <utility>
#include <vector>

#include "knob/last_failure.h"
#include "knob/live_kernel.h"
#include "knob/node_list.h"
#include "knob/node_table.h"
#include "knob/param_list.h"
#include "knob/signature.h"
#include "knob/status.h"
#include "platform/knob.h"
#include "platform/knob_status.h"

using Knob::Kernel;
using Knob::LiveKernel;
using Knob::Status;

namespace {

// Keeps why the calling thread's call failed, for the text of the status. A failure without a
// reason forgets the one before.
KNOB_ReturnStatus failed(KNOB_ReturnStatus status, const char *reason) noexcept {
  Knob::rememberFailure(status, reason);
  return status;
}

// Runs the body of a function; what it throws becomes the status.
template <typename F>
KNOB_ReturnStatus guarded(const F &body) noexcept {
  try {
    body();
    return KNOB_STATUS_SUCCESS;
  } catch (const Knob::KernelError &error) {
    return failed(static_cast<KNOB_ReturnStatus>(error.status), error.what());
  } catch (const std::bad_alloc &) {
    return failed(KNOB_STATUS_OUT_OF_MEMORY, "");
  } catch (const std::exception &error) {
    return failed(KNOB_STATUS_FAILURE, error.what());
  } catch (...) {
    return failed(KNOB_STATUS_FAILURE, "");
  }
}

template <typename Value>
void append(KNOB_ParamList *list, const Value &value) {
  if (list == nullptr || list->entries.size() >= list->capacity) {
    throw Knob::KernelError(Status::kBadParameter,
                            list == nullptr ? "no list" : "the list is full");
  }
  list->entries.emplace_back(std::in_place_type<Value>, value);
}

KNOB_ParamList *instanceList(const std::vector<int64_t> &ids) {
  auto list =
      std::make_unique<KNOB_ParamList>(KNOB_ParamList{Knob::ListKind::kInstance, ids.size(), {}});
  list->entries.assign(ids.begin(), ids.end());
  return list.release();
}

}  // namespace

extern "C" {

#pragma GCC visibility push(default)

// A node that knob.h does not declare is an error here: its object would not be exported.
#define KNOB_EXPORT_NODE(name, number, node)                                    \
  static_assert(std::is_same_v<decltype(KNOB_NODE_##name), const KNOB_NodeID>); \
  const KNOB_NodeID KNOB_NODE_##name = number;
KNOB_NODE_LIST(KNOB_EXPORT_NODE)
#undef KNOB_EXPORT_NODE

int KNOB_CheckSig(char *runningBuild, int size, const char **myBuild) {
  Knob::BuildSignature running, own;
  // A kernel that is not usable has no signature to compare; the calls that follow fail.
  const KNOB_ReturnStatus status = guarded([&] {
    own = Knob::buildSignature();
    running = LiveKernel::instance().with([](Kernel &kernel) { return kernel.signature(); });
  });
  Knob::forgetFailure();  // the result is not a status that has a text
  if (status != 0 || Knob::sameInterface(running, own)) return 0;

  if (runningBuild != nullptr && size > 0) {
    (void)std::snprintf(runningBuild, static_cast<size_t>(size), "%s", running.buildDate.c_str());
  }
  if (myBuild != nullptr) *myBuild = Knob::buildDate();
  return 1;
}

KNOB_ParamList *KNOB_ParamListCreate(int kind, int capacity) {
  const bool known = kind == static_cast<int>(Knob::ListKind::kInput) ||
                     kind == static_cast<int>(Knob::ListKind::kInstance);
  KNOB_ParamList *list = nullptr;
  if (known && capacity >= 0) {
    list = new (std::nothrow)
        KNOB_ParamList{static_cast<Knob::ListKind>(kind), static_cast<size_t>(capacity), {}};
  }
  // The caller reports a null list as a status of its own choice, which has no reason.
  if (list == nullptr) Knob::forgetFailure();
  return list;
}

KNOB_ReturnStatus KNOB_ParamListAddInt(KNOB_ParamList *list, int64_t value) {
  return guarded([&] { append(list, value); });
}

KNOB_ReturnStatus KNOB_ParamListAddString(KNOB_ParamList *list, const char *text) {
  return guarded([&] {
    if (text == nullptr) throw Knob::KernelError(Status::kBadParameter, "no text");
    append(list, std::string(text));
  });
}

void KNOB_ParamListDestroy(KNOB_ParamList *list) {
  delete list;
}

int KNOB_ParamListNumInstances(const KNOB_ParamList *list) {
  return list == nullptr ? 0 : static_cast<int>(list->entries.size());
}

KNOB_ReturnStatus KNOB_Get(KNOB_NodeID node, const KNOB_ParamList *instance, void *output,
                           size_t outputSize) {
  return guarded([&] {
    LiveKernel::instance().with(
        [&](Kernel &kernel) { Knob::getNode(kernel, node, instance, output, outputSize); });
  });
}

KNOB_ReturnStatus KNOB_Set(KNOB_NodeID node, const KNOB_ParamList *instance,
                           const KNOB_ParamList *input, void *output, size_t outputSize) {
  return guarded([&] {
    LiveKernel::instance().with(
        [&](Kernel &kernel) { Knob::setNode(kernel, node, instance, input, output, outputSize); });
  });
}

KNOB_ReturnStatus KNOB_GetInstanceListAlloc(KNOB_NodeID node, const KNOB_ParamList *instance,
                                            KNOB_ParamList **result) {
  return guarded([&] {
    const std::vector<int64_t> ids = LiveKernel::instance().with(
        [&](Kernel &kernel) { return Knob::listNode(kernel, node, instance); });
    if (result == nullptr) throw Knob::KernelError(Status::kBufferSize);
    *result = instanceList(ids);
  });
}

const char *NUC_ReturnStatusToString(KNOB_ReturnStatus status) {
  return Knob::explainedStatusText(status);
}

#pragma GCC visibility pop

}  // extern "C"
