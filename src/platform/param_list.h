// SPDX-License-Identifier: Apache-2.0
// The owner of one KNOB parameter list.
#pragma once

#include "platform/knob.h"

// Empty when the platform could not make the list; whether that is an exception or a status is
// the caller's choice. Lists are destroyed in the reverse order of their declaration.
class ParamList {
 public:
  enum class Kind { kInput = 0, kInstance = 1 };

  ParamList(Kind kind, int capacity)
      : list_(KNOB_ParamListCreate(static_cast<int>(kind), capacity)) {}
  // Takes over a list that the platform handed out; null is accepted.
  explicit ParamList(KNOB_ParamList *list) : list_(list) {}
  ~ParamList() {
    if (list_ != nullptr) KNOB_ParamListDestroy(list_);
  }
  ParamList(const ParamList &) = delete;
  ParamList &operator=(const ParamList &) = delete;

  KNOB_ParamList *get() const { return list_; }
  explicit operator bool() const { return list_ != nullptr; }

 private:
  KNOB_ParamList *list_;
};
