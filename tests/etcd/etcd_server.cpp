// SPDX-License-Identifier: Apache-2.0
// Readiness is read from etcd itself, in short steps and within a limit, never guessed from time.
#include "etcd_server.h"

#include <arpa/inet.h>
#include <fcntl.h>
#include <netinet/in.h>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <csignal>
#include <set>
#include <stdexcept>
#include <system_error>
#include <thread>

#include "common/unique_fd.h"
#include "kestrel/etcd/http_client.h"
#include "process.h"
#include "temp_folder.h"

namespace Test {

using Platform::UniqueFd;

namespace fs = std::filesystem;

namespace {

constexpr std::chrono::seconds kMaxStart{60};
constexpr std::chrono::milliseconds kStep{10};

// A cluster must not change its leader because two CPUs are busy for a moment; a single server
// waits for no other.
std::vector<std::string> timing(int count) {
  if (count == 1) return {"--heartbeat-interval=10", "--election-timeout=100"};
  return {"--heartbeat-interval=100", "--election-timeout=1000"};
}

std::string joined(const std::vector<std::string> &words) {
  std::string text;
  for (const std::string &word : words) text += (text.empty() ? "" : ",") + word;
  return text;
}

}  // namespace

std::string ownAddress() {
  const auto pid = static_cast<unsigned>(getpid());
  return "127." + std::to_string(64 + (pid >> 16 & 0x3f)) + "." + std::to_string(pid >> 8 & 0xff) +
         "." + std::to_string(pid & 0xff);
}

std::string freePlace() {
  // The kernel may give a port again that was bound and closed before.
  static std::set<in_port_t> drawn;
  const std::string host = ownAddress();
  sockaddr_in address{};
  do {
    const UniqueFd socket(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
    address = {};
    address.sin_family = AF_INET;
    inet_pton(AF_INET, host.c_str(), &address.sin_addr);
    socklen_t size = sizeof address;
    auto *generic = reinterpret_cast<sockaddr *>(&address);
    if (bind(socket.get(), generic, size) != 0 || getsockname(socket.get(), generic, &size) != 0) {
      throw std::system_error(errno, std::generic_category(), "a free port");
    }
  } while (!drawn.insert(address.sin_port).second);
  return host + ":" + std::to_string(ntohs(address.sin_port));
}

EtcdMember::EtcdMember(std::string url, std::vector<std::string> commandLine, fs::path log)
    : url_(std::move(url)), commandLine_(std::move(commandLine)), logPath_(std::move(log)) {}

EtcdMember::~EtcdMember() {
  if (running()) kill();
}

void EtcdMember::start() {
  std::vector<char *> arguments;
  for (std::string &word : commandLine_) arguments.push_back(word.data());
  arguments.push_back(nullptr);
  const UniqueFd log(open(logPath_.c_str(), O_WRONLY | O_CREAT | O_APPEND | O_CLOEXEC, 0600));
  const pid_t parent = getpid();
  const pid_t pid = fork();
  if (pid < 0) throw std::system_error(errno, std::generic_category(), "fork");
  if (pid == 0) {
    // The server ends with the test, even when the test is killed.
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    if (getppid() != parent) _exit(127);
    dup2(log.get(), 1);
    dup2(log.get(), 2);
    execv(arguments[0], arguments.data());
    dprintf(2, "%s: %s\n", arguments[0], std::generic_category().message(errno).c_str());
    _exit(127);
  }
  pid_ = pid;
}

void EtcdMember::signal(int number) const {
  if (::kill(pid_, number) != 0) throw std::system_error(errno, std::generic_category(), "kill");
}

void EtcdMember::kill() {
  signal(SIGKILL);
  while (waitpid(pid_, nullptr, 0) < 0 && errno == EINTR) {
  }
  pid_ = -1;
}

void EtcdMember::stop() {
  signal(SIGSTOP);
  int status = 0;
  while (waitpid(pid_, &status, WUNTRACED) < 0 && errno == EINTR) {
  }
}

void EtcdMember::resume() {
  signal(SIGCONT);
}

std::string EtcdMember::log() const {
  return readFile(logPath_);
}

Etcd::Etcd(const fs::path &folder, int count, const EtcdOptions &options) {
  std::vector<std::string> clients, peers, cluster;
  for (int i = 0; i < count; ++i) {
    clients.push_back("http://" + freePlace());
    peers.push_back("http://" + freePlace());
    cluster.push_back("m" + std::to_string(i) + "=" + peers.back());
  }
  for (int i = 0; i < count; ++i) {
    const std::string name = "m" + std::to_string(i);
    const auto index = static_cast<size_t>(i);
    std::vector<std::string> listenAt = {clients[index]};
    if (!options.alsoAt.empty()) listenAt.push_back(options.alsoAt);
    const std::string listening = joined(listenAt);
    std::vector<std::string> line = {"/usr/bin/etcd",
                                     "--name=" + name,
                                     "--data-dir=" + (folder / (name + ".etcd")).string(),
                                     "--listen-client-urls=" + listening,
                                     "--advertise-client-urls=" + clients[index],
                                     "--listen-peer-urls=" + peers[index],
                                     "--initial-advertise-peer-urls=" + peers[index],
                                     "--initial-cluster=" + joined(cluster),
                                     "--bcrypt-cost=4",
                                     "--logger=zap"};
    for (const auto &more : {timing(count), options.arguments}) {
      line.insert(line.end(), more.begin(), more.end());
    }
    members_.push_back(
        std::make_unique<EtcdMember>(clients[index], std::move(line), folder / (name + ".log")));
    members_.back()->start();
  }
  for (size_t i = 0; i < members_.size(); ++i) awaitReady(i);
}

std::vector<std::string> Etcd::urls() const {
  std::vector<std::string> result;
  for (const auto &member : members_) result.push_back(member->url());
  return result;
}

// A linearizable read. A server that refuses it for want of a user is ready, too.
void Etcd::awaitReady(size_t index) {
  constexpr long kBadRequest = 400;
  Kestrel::Etcd::HttpClient client{Kestrel::Configuration()};
  const auto end = std::chrono::steady_clock::now() + kMaxStart;
  while (std::chrono::steady_clock::now() < end) {
    const auto response =
        client.post({member(index).url() + "/v3/kv/range", "{\"key\":\"AA==\"}", "",
                     std::chrono::seconds(5), std::chrono::seconds(5), size_t{1} << 16, false});
    if (response.status == 200 || response.status == kBadRequest) return;
    std::this_thread::sleep_for(kStep);
  }
  throw std::runtime_error("etcd does not become ready:\n" + member(index).log());
}

Kestrel::Configuration Etcd::configuration() const {
  Kestrel::Configuration result;
  result.file = "test";
  result.engine = Kestrel::Engine::kEtcd;
  result.endpoints = urls();
  // No test depends on how fast this machine is, unless it sets its own times.
  result.runTimeout = std::chrono::seconds(60);
  result.timeout = std::chrono::seconds(20);
  return result;
}

std::string Etcd::configurationText() const {
  return "store = etcd\nendpoints = " + joined(urls()) + "\ntimeout-ms = 20000\n";
}

std::string Etcd::etcdctl(const std::vector<std::string> &arguments,
                          const std::string &input) const {
  Command command;
  command.program = "/usr/bin/etcdctl";
  command.arguments = {"--endpoints=" + joined(urls()), "--command-timeout=20s"};
  command.arguments.insert(command.arguments.end(), arguments.begin(), arguments.end());
  command.environment = {{"ETCDCTL_API", "3"}};
  command.input = input;
  const ProcessResult result = run(command);
  if (result.status != 0) throw std::runtime_error("etcdctl: " + result.out + result.err);
  return result.out;
}

}  // namespace Test
