// SPDX-License-Identifier: Apache-2.0
// Servers that are no etcd: each test says what they answer, and when.
#pragma once

#include <atomic>
#include <chrono>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "common/unique_fd.h"

namespace Test {

using Platform::UniqueFd;

struct FakeRequest {
  std::string path, head, body;
};

// Listens on a loopback address of the test's own until it is destroyed. Requests are taken one
// after the other on each connection, connections at the same time.
class FakeServer {
 public:
  // What goes back over the connection, byte for byte. After an empty answer, and after one that
  // says "Connection: close", the connection is closed.
  using Respond = std::function<std::string(const FakeRequest &request)>;

  // perByte: the pause after each byte of an answer.
  explicit FakeServer(Respond respond,
                      std::chrono::milliseconds perByte = std::chrono::milliseconds(0));
  FakeServer(const FakeServer &) = delete;
  FakeServer &operator=(const FakeServer &) = delete;
  ~FakeServer();

  std::string url() const { return "http://" + place_; }
  int requests() const { return requests_; }
  int connections() const { return connections_; }

  // To be called by an answer that takes its time: waits so long, or until the server goes.
  void wait(std::chrono::milliseconds time) const;

 private:
  void serve();
  void serveConnection(UniqueFd connection);
  bool sendAll(int fd, const std::string &text) const;

  Respond respond_;
  std::chrono::milliseconds perByte_;
  std::string place_;
  UniqueFd listener_, end_;
  std::atomic<int> requests_{0}, connections_{0};
  std::vector<std::thread> conversations_;
  std::thread listening_;
};

// A whole HTTP answer.
std::string httpResponse(int status, const std::string &body);

// A range's answer without a key.
std::string emptyRange(const std::string &revision = "7", const std::string &cluster = "1");

// A range's answer with one key; both in plain bytes.
std::string rangeOf(const std::string &key, const std::string &value,
                    const std::string &revision = "7", const std::string &cluster = "1");

}  // namespace Test
