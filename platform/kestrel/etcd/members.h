// SPDX-License-Identifier: Apache-2.0
// The members of the cluster: which of them is asked, when, and for how long. What a run has
// learned about a member holds to the end of the run: a member that failed is not asked again, and
// when none is left every request fails at once.
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
#include "kestrel/etcd/refusal.h"
#include "platform/kestrel_config_store.h"

namespace Kestrel::Etcd {

// The cluster refused the request; another member would refuse it too.
class RequestRefused : public KestrelConfigStore::ConfigStoreException {
 public:
  enum class Why { kCompacted, kTooLarge, kPermission, kOther };

  RequestRefused(Why why, std::string message)
      : ConfigStoreException(std::move(message)), why_(why) {}
  Why why() const { return why_; }

 private:
  Why why_;
};

// No member could be reached or responded in time, and none refused anything: no password, no
// certificate, no permission. Only then may older values be used.
class ClusterUnavailable : public KestrelConfigStore::ConfigStoreException {
 public:
  using ConfigStoreException::ConfigStoreException;
};

class Members {
 public:
  // Takes the body of a response. Where it throws ProtocolError, the member has failed.
  using Take = std::function<void(const std::string &json)>;

  // How recent a read is. kCurrent: the cluster agreed on it (linearizable). kAny: a member's own
  // data, used only when no member gave a linearizable response within half of the time.
  enum class Freshness { kCurrent, kAny };

  // The largest response that is accepted. etcd itself accepts no value beyond 1.5 MiB unless it is
  // configured to.
  static constexpr size_t kMaxResponseBytes = size_t{16} << 20;

  // Asks no server. Throws a ConfigStoreException when the settings cannot be used.
  explicit Members(const Configuration &configuration);

  // Asks one member, after 200 ms without a response the next one as well, and so on; the first
  // good response counts. Returns how recent it is: kCurrent, unless ALLOWED is kAny and no quorum
  // responded. maxBytes: a larger response is RequestRefused kTooLarge. Throws RequestRefused,
  // ClusterUnavailable, or another ConfigStoreException.
  Freshness read(ReadRequest request, const std::string &subject, Freshness allowed,
                 const Deadline &deadline, size_t maxBytes, const Take &take);

  // Sends a change, each time on a new connection, to one member after the other until one has
  // received it; then its response is waited for within timeout-ms. When that response is lost, the
  // exception says that it is not known whether the change was made.
  void change(const char *path, const std::string &json, const std::string &subject,
              const Take &take);

  // Throws ProtocolError when a response comes from another cluster than the ones before it.
  void checkCluster(const Header &header);
  const std::string &cluster() const { return cluster_; }

  // From now on every request fails with this text, without asking a server.
  void giveUp(const std::string &why) { gone_ = why; }

  const std::vector<std::string> &endpoints() const { return endpoints_; }

  // The state of one member, for people. Not part of what the run learns.
  struct Health {
    std::string text;
    std::string problem;  // why the member accepts no change; empty: it does
  };
  Health health(const std::string &endpoint);

 private:
  struct Member {
    std::string url;
    std::string failure;     // empty: not asked yet, or it responded
    bool untrusted = false;  // the failure is a refused certificate
  };
  struct Request {
    const char *path;
    std::string json;
    std::string subject;  // what the request is about, for messages
    size_t maxBytes;
  };
  // How one round over the members ended.
  struct Outcome {
    enum class End {
      kTaken,    // a response was taken
      kRefused,  // a member refused; the refusal is below
      kNone,     // every member failed, or the deadline passed
    };
    End end = End::kNone;
    Refusal refusal;
    std::string url;
  };
  class Round;

  std::vector<Member *> usable();
  bool race(const Request &request, const Deadline &deadline, const Take &take);
  Outcome round(const Request &request, const Deadline &deadline, const Take &take);
  bool authenticate(const Deadline &deadline);
  void renewToken(const Request &request, const Outcome &outcome, bool *renewed);
  bool changeThrough(Member &member, const Request &request, std::chrono::milliseconds connect,
                     const Deadline &deadline, const Take &take);
  void markSilent(const std::string &why);
  [[noreturn]] void refuse(const Request &request, const Refusal &refusal, const std::string &url);
  [[noreturn]] void failUnavailable(const std::string &subject);
  std::string failures() const;

  std::vector<std::string> endpoints_;
  std::vector<Member> members_;
  size_t preferred_ = 0;  // the member that responded last
  std::chrono::milliseconds timeout_;
  std::string user_, passwordFile_;
  HttpClient http_;
  std::optional<std::string> token_;  // empty optional: not asked for yet; "": no token is needed
  std::string cluster_;               // empty: no member has responded yet
  std::string gone_;                  // why nothing is asked any more; empty: requests are sent
  bool unavailable_ = false;          // gone because no member could be reached
};

}  // namespace Kestrel::Etcd
