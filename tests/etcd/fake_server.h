// SPDX-License-Identifier: Apache-2.0
// Servers that are not etcd: each test decides what they send, and when.
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
  // Returns what is sent over the connection, byte for byte. After an empty response, and after one
  // with "Connection: close", the connection is closed.
  using Respond = std::function<std::string(const FakeRequest &request)>;

  // perByte: the pause after each byte of a response.
  explicit FakeServer(Respond respond,
                      std::chrono::milliseconds perByte = std::chrono::milliseconds(0));
  FakeServer(const FakeServer &) = delete;
  FakeServer &operator=(const FakeServer &) = delete;
  ~FakeServer();

  std::string url() const { return "http://" + place_; }
  int requests() const { return requests_; }
  int connections() const { return connections_; }

  // For a response that takes its time: waits so long, or until the server ends.
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

// A whole HTTP response.
std::string httpResponse(int status, const std::string &body);

// The response to a range, without a key.
std::string emptyRange(const std::string &revision = "7", const std::string &cluster = "1");

// The same with one key; key and value in plain bytes.
std::string rangeOf(const std::string &key, const std::string &value,
                    const std::string &revision = "7", const std::string &cluster = "1");

}  // namespace Test
