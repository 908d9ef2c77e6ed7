// SPDX-License-Identifier: Apache-2.0
// Blocks pass in both directions until one side closes, the proxy ends, or chance cuts.
#include "cutting_proxy.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>

#include <cerrno>
#include <chrono>
#include <system_error>

#include "etcd_server.h"

namespace Test {

namespace {

sockaddr_in addressOf(const std::string &place) {
  const size_t colon = place.find(':');
  sockaddr_in address{};
  address.sin_family = AF_INET;
  inet_pton(AF_INET, place.substr(0, colon).c_str(), &address.sin_addr);
  const std::string port = colon == std::string::npos ? "0" : place.substr(colon + 1);
  address.sin_port = htons(static_cast<uint16_t>(std::stoul(port)));
  return address;
}

UniqueFd listenHere(std::string *place) {
  UniqueFd socket(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_in address = addressOf(ownAddress());
  socklen_t size = sizeof address;
  auto *generic = reinterpret_cast<sockaddr *>(&address);
  if (bind(socket.get(), generic, size) != 0 || listen(socket.get(), 64) != 0 ||
      getsockname(socket.get(), generic, &size) != 0) {
    throw std::system_error(errno, std::generic_category(), "listening");
  }
  *place = ownAddress() + ":" + std::to_string(ntohs(address.sin_port));
  return socket;
}

bool sendAll(int fd, const char *data, size_t size) {
  while (size > 0) {
    const ssize_t count = send(fd, data, size, MSG_NOSIGNAL);
    if (count <= 0) return false;
    data += count;
    size -= static_cast<size_t>(count);
  }
  return true;
}

}  // namespace

CuttingProxy::CuttingProxy(std::string target, unsigned seed)
    : target_(std::move(target)),
      seed_(seed),
      listener_(listenHere(&place_)),
      end_(eventfd(0, EFD_CLOEXEC)) {
  listening_ = std::thread([this] { serve(); });
}

CuttingProxy::~CuttingProxy() {
  eventfd_write(end_.get(), 1);
  listening_.join();
  for (std::thread &connection : connections_) connection.join();
}

void CuttingProxy::serve() {
  for (;;) {
    pollfd both[2] = {{listener_.get(), POLLIN, 0}, {end_.get(), POLLIN, 0}};
    if (poll(both, 2, -1) < 0 && errno == EINTR) continue;
    if (both[1].revents != 0) return;
    const int fd = accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC);
    if (fd < 0) continue;
    connections_.emplace_back(
        [this, client = UniqueFd(fd), seed = ++seed_ * 2654435761U]() mutable {
          forward(std::move(client), seed);
        });
  }
}

void CuttingProxy::forward(UniqueFd client, unsigned seed) {
  std::minstd_rand random(seed);
  const UniqueFd server(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_in address = addressOf(target_);
  if (connect(server.get(), reinterpret_cast<sockaddr *>(&address), sizeof address) != 0) return;
  for (;;) {
    pollfd fds[3] = {{client.get(), POLLIN, 0}, {server.get(), POLLIN, 0}, {end_.get(), POLLIN, 0}};
    if (poll(fds, 3, -1) < 0 && errno == EINTR) continue;
    if (fds[2].revents != 0) return;
    if (fds[0].revents != 0 && !pass(client.get(), server.get(), &random, false)) return;
    if (fds[1].revents != 0 && !pass(server.get(), client.get(), &random, true)) return;
  }
}

// false: the connection ends here.
bool CuttingProxy::pass(int from, int to, std::minstd_rand *random, bool response) {
  char block[65536];
  const ssize_t count = recv(from, block, sizeof block, 0);
  if (count <= 0) return false;
  const unsigned chance = std::uniform_int_distribution<unsigned>(0, 99)(*random);
  if (!calm_ && chance < 20) {
    std::this_thread::sleep_for(std::chrono::milliseconds(chance * 3));
  } else if (!calm_ && chance < 30 && response) {
    // The server has acted; the client learns nothing, or a part.
    ++cuts_;
    if (chance < 25) (void)sendAll(to, block, static_cast<size_t>(count) / 2);
    return false;
  } else if (!calm_ && chance < 33) {
    ++cuts_;
    return false;
  }
  return sendAll(to, block, static_cast<size_t>(count));
}

}  // namespace Test
