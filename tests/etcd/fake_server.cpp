// SPDX-License-Identifier: Apache-2.0
// As much of HTTP as libcurl needs, and not more.
#include "fake_server.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>

#include <cerrno>
#include <optional>
#include <system_error>

#include "etcd_server.h"
#include "kestrel/etcd/base64.h"

namespace Test {

namespace {

UniqueFd listenOn(std::string *place) {
  UniqueFd socket(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_in address{};
  address.sin_family = AF_INET;
  inet_pton(AF_INET, ownAddress().c_str(), &address.sin_addr);
  socklen_t size = sizeof address;
  auto *generic = reinterpret_cast<sockaddr *>(&address);
  if (bind(socket.get(), generic, size) != 0 || listen(socket.get(), 64) != 0 ||
      getsockname(socket.get(), generic, &size) != 0) {
    throw std::system_error(errno, std::generic_category(), "listening");
  }
  *place = ownAddress() + ":" + std::to_string(ntohs(address.sin_port));
  return socket;
}

// True when there is something to read before the server ends.
bool readable(int fd, int end) {
  pollfd both[2] = {{fd, POLLIN, 0}, {end, POLLIN, 0}};
  while (poll(both, 2, -1) < 0 && errno == EINTR) {
  }
  return both[1].revents == 0;
}

size_t lengthIn(const std::string &head) {
  const std::string name = "Content-Length: ";
  const size_t at = head.find(name);
  return at == std::string::npos ? 0 : std::stoul(head.substr(at + name.size()));
}

// Nothing: the other side has gone, or the server ends.
std::optional<FakeRequest> readRequest(int fd, int end) {
  std::string text;
  char block[65536];
  for (;;) {
    const size_t headEnd = text.find("\r\n\r\n");
    if (headEnd != std::string::npos) {
      const std::string head = text.substr(0, headEnd);
      const std::string body = text.substr(headEnd + 4);
      const size_t from = head.find(' ') + 1;
      if (body.size() >= lengthIn(head)) {
        return FakeRequest{head.substr(from, head.find(' ', from) - from), head, body};
      }
    }
    if (!readable(fd, end)) return std::nullopt;
    const ssize_t count = recv(fd, block, sizeof block, 0);
    if (count <= 0) return std::nullopt;
    text.append(block, static_cast<size_t>(count));
  }
}

std::string headerText(const std::string &revision, const std::string &cluster) {
  return R"({"header":{"cluster_id":")" + cluster + R"(","member_id":"2","revision":")" + revision +
         R"(","raft_term":"2"})";
}

}  // namespace

FakeServer::FakeServer(Respond respond, std::chrono::milliseconds perByte)
    : respond_(std::move(respond)),
      perByte_(perByte),
      listener_(listenOn(&place_)),
      end_(eventfd(0, EFD_CLOEXEC)) {
  listening_ = std::thread([this] { serve(); });
}

FakeServer::~FakeServer() {
  eventfd_write(end_.get(), 1);
  listening_.join();
  for (std::thread &conversation : conversations_) conversation.join();
}

void FakeServer::wait(std::chrono::milliseconds time) const {
  pollfd end{end_.get(), POLLIN, 0};
  (void)poll(&end, 1, static_cast<int>(time.count()));
}

void FakeServer::serve() {
  while (readable(listener_.get(), end_.get())) {
    const int fd = accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC);
    if (fd < 0) continue;
    ++connections_;
    conversations_.emplace_back(
        [this, connection = UniqueFd(fd)]() mutable { serveConnection(std::move(connection)); });
  }
}

void FakeServer::serveConnection(UniqueFd connection) {
  // A client that reads nothing more must not keep the server for ever.
  const timeval limit{5, 0};
  setsockopt(connection.get(), SOL_SOCKET, SO_SNDTIMEO, &limit, sizeof limit);
  while (const auto request = readRequest(connection.get(), end_.get())) {
    ++requests_;
    const std::string response = respond_(*request);
    if (!sendAll(connection.get(), response)) return;
    if (response.empty() || response.find("Connection: close") != std::string::npos) return;
  }
}

bool FakeServer::sendAll(int fd, const std::string &text) const {
  const bool slow = perByte_.count() != 0;
  for (size_t at = 0; at < text.size();) {
    const ssize_t count = send(fd, text.data() + at, slow ? 1 : text.size() - at, MSG_NOSIGNAL);
    if (count <= 0) return false;
    at += static_cast<size_t>(count);
    if (slow) wait(perByte_);
  }
  return true;
}

std::string httpResponse(int status, const std::string &body) {
  return "HTTP/1.1 " + std::to_string(status) + " Text\r\nContent-Type: application/json\r\n" +
         "Content-Length: " + std::to_string(body.size()) + "\r\n\r\n" + body;
}

std::string emptyRange(const std::string &revision, const std::string &cluster) {
  return httpResponse(200, headerText(revision, cluster) + "}");
}

std::string rangeOf(const std::string &key, const std::string &value, const std::string &revision,
                    const std::string &cluster) {
  const std::string pair = R"({"key":")" + Kestrel::Etcd::toBase64(key) +
                           R"(","create_revision":"2","mod_revision":"2","version":"1","value":")" +
                           Kestrel::Etcd::toBase64(value) + "\"}";
  return httpResponse(200,
                      headerText(revision, cluster) + R"(,"kvs":[)" + pair + R"(],"count":"1"})");
}

}  // namespace Test
