// SPDX-License-Identifier: Apache-2.0
// Runs a function on a thread whose stack has a known size.
#pragma once

#include <pthread.h>

#include <cstddef>
#include <functional>
#include <stdexcept>

inline void runOnStackOf(std::size_t bytes, const std::function<void()> &body) {
  pthread_attr_t attributes;
  if (pthread_attr_init(&attributes) != 0) throw std::runtime_error("no thread attributes");
  if (pthread_attr_setstacksize(&attributes, bytes) != 0) {
    pthread_attr_destroy(&attributes);
    throw std::runtime_error("no stack of that size");
  }
  const auto run = [](void *argument) -> void * {
    (*static_cast<const std::function<void()> *>(argument))();
    return nullptr;
  };
  pthread_t thread;
  const int status =
      pthread_create(&thread, &attributes, run, const_cast<std::function<void()> *>(&body));
  pthread_attr_destroy(&attributes);
  if (status != 0) throw std::runtime_error("no thread");
  pthread_join(thread, nullptr);
}
