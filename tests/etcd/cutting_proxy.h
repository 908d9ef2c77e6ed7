// SPDX-License-Identifier: Apache-2.0
// A TCP proxy that breaks connections: before a response, within one, or after a delay.
#pragma once

#include <atomic>
#include <random>
#include <string>
#include <thread>
#include <vector>

#include "common/unique_fd.h"

namespace Test {

using Platform::UniqueFd;

class CuttingProxy {
 public:
  // target: "HOST:PORT". seed: for the order of what happens to the blocks that pass.
  CuttingProxy(std::string target, unsigned seed);
  CuttingProxy(const CuttingProxy &) = delete;
  CuttingProxy &operator=(const CuttingProxy &) = delete;
  ~CuttingProxy();

  std::string url() const { return "http://" + place_; }
  int cuts() const { return cuts_; }

  // From now on everything passes unchanged.
  void calm() { calm_ = true; }

 private:
  void serve();
  void forward(UniqueFd client, unsigned seed);
  bool pass(int from, int to, std::minstd_rand *random, bool response);

  std::string target_, place_;
  unsigned seed_;
  UniqueFd listener_, end_;
  std::atomic<bool> calm_{false};
  std::atomic<int> cuts_{0};
  std::vector<std::thread> connections_;
  std::thread listening_;
};

}  // namespace Test
