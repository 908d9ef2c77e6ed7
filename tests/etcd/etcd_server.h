// SPDX-License-Identifier: Apache-2.0
// Real etcd servers for one test: on a loopback address of the test's own, with their data in the
// test's folder, and they end with the test, however it ends.
#pragma once

#include <sys/types.h>

#include <filesystem>
#include <memory>
#include <string>
#include <vector>

#include "kestrel/configuration.h"

namespace Test {

// A loopback address that no other test process uses at the same time.
std::string ownAddress();

// "HOST:PORT" on that address, where no process listens; another one at each call of a process.
std::string freePlace();

struct EtcdOptions {
  std::vector<std::string> arguments;  // more of etcd's own
  std::string alsoAt;                  // one more address of the only member, such as an https one
};

// One etcd process. It is killed in the end.
class EtcdMember {
 public:
  EtcdMember(std::string url, std::vector<std::string> commandLine, std::filesystem::path log);
  EtcdMember(const EtcdMember &) = delete;
  EtcdMember &operator=(const EtcdMember &) = delete;
  ~EtcdMember();

  const std::string &url() const { return url_; }
  bool running() const { return pid_ > 0; }
  pid_t pid() const { return pid_; }

  void start();
  void kill();    // at once, and it is gone when this returns
  void stop();    // SIGSTOP: it keeps its connections and sends nothing
  void resume();  // SIGCONT
  std::string log() const;

 private:
  void signal(int number) const;

  std::string url_;
  std::vector<std::string> commandLine_;
  std::filesystem::path logPath_;
  pid_t pid_ = -1;
};

// One server, or a cluster of several, ready for requests.
class Etcd {
 public:
  Etcd(const std::filesystem::path &folder, int count, const EtcdOptions &options = {});

  EtcdMember &member(size_t index) { return *members_.at(index); }
  std::vector<std::string> urls() const;

  // Waits until this member takes part in a cluster that has a leader.
  void awaitReady(size_t index);

  // What a host's configuration would say: all members in order.
  Kestrel::Configuration configuration() const;
  std::string configurationText() const;

  // Runs etcdctl against all members; what it printed. Throws when it fails.
  std::string etcdctl(const std::vector<std::string> &arguments,
                      const std::string &input = {}) const;

 private:
  std::vector<std::unique_ptr<EtcdMember>> members_;
};

}  // namespace Test
