// SPDX-License-Identifier: Apache-2.0
// The members of the cluster, asked in turn. What a run has learned of them holds to its end: a
// member that failed is not asked again, and when none is left nothing is asked any more and
// nothing waits.
#pragma once

#include <chrono>
#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <vector>

#include "kestrel/configuration.h"
#include "kestrel/etcd/deadline.h"
#include "kestrel/etcd/http_client.h"
#include "kestrel/etcd/protocol.h"
#include "platform/kestrel_config_store.h"

namespace Kestrel::Etcd {

// The cluster's answer is no: another member would say the same.
class RequestRefused : public KestrelConfigStore::ConfigStoreException {
 public:
  enum class Why { kCompacted, kTooLargeResponse, kOther };

  RequestRefused(Why why, std::string message)
      : ConfigStoreException(std::move(message)), why_(why) {}
  Why why() const { return why_; }

 private:
  Why why_;
};

struct Request {
  enum class Kind {
    kRead,
    kPage,    // a read whose answer may turn out too large: that is then no fault of the member's
    kChange,  // when its answer is lost it is not sent again, for it may have been made
  };

  Kind kind = Kind::kRead;
  const char *path = "";
  std::string json;
  std::string subject;  // what it is about, for messages
};

class Members {
 public:
  // No larger answer is taken. etcd itself takes no value beyond 1.5 MiB unless it is told to.
  static constexpr size_t kMaxResponseBytes = size_t{16} << 20;

  // Asks no server. Throws a ConfigStoreException when the settings cannot be used.
  explicit Members(const Configuration &configuration);

  // Sends a request to one member after the other until one answers, within timeout-ms in all. Each
  // has an equal part of what is left; one that has got a change has all of it, for nobody is asked
  // after it. read: takes the answer; where it throws ProtocolError, the member has failed. Throws
  // RequestRefused, or another ConfigStoreException when none answers.
  using Read = std::function<void(const std::string &json)>;
  void ask(const Request &request, const Read &read);

  // Nothing is asked from now on: every request fails with these words.
  void giveUp(const std::string &why) { gone_ = why; }

  const std::vector<std::string> &endpoints() const { return endpoints_; }

  // How one member is doing, for people. It counts for nothing in the run.
  std::string condition(const std::string &endpoint);

 private:
  struct Member {
    std::string url;
    std::string failure;  // empty: not asked yet, or answering
  };

  std::vector<Member *> usable();
  void attempt(const Member &member, const Request &request, const Read &read, const Deadline &part,
               const Deadline &whole);
  HttpResponse send(const Member &member, const Request &request, TimeLimits limits);
  void authenticate(const Member &member, const Deadline &part);
  void renewToken(const Member &member, const Request &request, const Refusal &refusal,
                  bool *renewed);
  [[noreturn]] void giveUpAndThrow(const std::string &subject, const std::string &why);
  std::string failures() const;

  std::vector<std::string> endpoints_;
  std::vector<Member> members_;
  std::chrono::milliseconds timeout_;
  std::string user_, passwordFile_;
  HttpClient http_;
  std::optional<std::string> token_;  // nothing: not asked for yet; empty: the server wants none
  std::string gone_;                  // why nothing is asked any more; empty: it is
};

}  // namespace Kestrel::Etcd
