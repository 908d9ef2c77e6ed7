// SPDX-License-Identifier: Apache-2.0
// Which member is asked and for how long, and what its refusal means. The content of a response is
// the caller's.
#include "kestrel/etcd/members.h"

#include <algorithm>
#include <cstring>
#include <stdexcept>
#include <string_view>
#include <thread>
#include <utility>

#include "kestrel/errors.h"
#include "kestrel/etcd/password_file.h"
#include "kestrel/text.h"

namespace Kestrel::Etcd {

namespace {

using Milliseconds = std::chrono::milliseconds;

constexpr const char *kWhere = "etcd";

// After this time without a response the next member is asked as well.
constexpr Milliseconds kHedge{200};
constexpr Milliseconds kPause{20};  // for members to catch up, or to elect a leader
constexpr Milliseconds kGrace{20};

// Why one member gave no usable response.
class MemberFailure : public std::runtime_error {
 public:
  MemberFailure(const std::string &why, bool mayHaveActedThere, bool untrustedThere = false)
      : std::runtime_error(why), mayHaveActed(mayHaveActedThere), untrusted(untrustedThere) {}
  const bool mayHaveActed;
  const bool untrusted;
};

// etcd sends this as plain text, before any other check of the request.
constexpr std::string_view kCommonName = "CommonName of client";

Refusal refusalOf(const HttpResponse &response) {
  try {
    if (auto refusal = readRefusal(response.body)) return std::move(*refusal);
  } catch (const ProtocolError &) {
    // Not JSON: like any other unknown text.
  }
  if (response.body.compare(0, kCommonName.size(), kCommonName) == 0) {
    throw MemberFailure("it has users, and then accepts no client certificate with a common name",
                        false, true);
  }
  throw MemberFailure(
      "HTTP status " + std::to_string(response.status) + " without a message from etcd", true);
}

void takeOrFail(const Members::Take &take, const std::string &json) {
  try {
    take(json);
  } catch (const ProtocolError &error) {
    throw MemberFailure(std::string("the response is not etcd's: ") + error.what(), true);
  }
}

// Throws MemberFailure for a response that is not one, and RequestRefused for one that is too
// large.
void checkCompleted(const HttpResponse &response, const std::string &url,
                    const std::string &subject) {
  switch (response.end) {
    case HttpResponse::End::kCompleted:
      return;
    case HttpResponse::End::kTooLarge:
      throw RequestRefused(RequestRefused::Why::kTooLarge,
                           storeError(url, subject, response.problem).what());
    case HttpResponse::End::kUntrusted:
      throw MemberFailure(response.problem, response.sent, true);
    case HttpResponse::End::kFailed:
      throw MemberFailure(response.problem, response.sent);
  }
}

}  // namespace

Members::Members(const Configuration &configuration)
    : endpoints_(configuration.endpoints),
      timeout_(configuration.timeout),
      user_(configuration.user),
      passwordFile_(configuration.passwordFile),
      http_(configuration) {
  for (const std::string &endpoint : endpoints_) members_.push_back({endpoint, "", false});
  if (user_.empty()) token_ = "";
}

Members::Freshness Members::read(ReadRequest request, const std::string &subject, Freshness allowed,
                                 const Deadline &deadline, size_t maxBytes, const Take &take) {
  if (!gone_.empty() && unavailable_)
    throw ClusterUnavailable(storeError(kWhere, subject, gone_).what());
  if (!gone_.empty()) throw storeError(kWhere, subject, gone_);
  request.serializable = false;
  const bool mayBeOld = allowed == Freshness::kAny;
  const Deadline quorum(mayBeOld ? deadline.left() / 2 : deadline.left());
  if (race({readPath(request), readText(request), subject, maxBytes}, quorum, take)) {
    return Freshness::kCurrent;
  }
  // Members without a quorum are silent to a linearizable read, and respond to this one.
  request.serializable = true;
  if (mayBeOld && race({readPath(request), readText(request), subject, maxBytes}, deadline, take)) {
    return Freshness::kAny;
  }
  markSilent("no response in time");
  failUnavailable(subject);
}

std::vector<Members::Member *> Members::usable() {
  std::vector<Member *> result;
  for (size_t i = 0; i < members_.size(); ++i) {
    Member &member = members_[(preferred_ + i) % members_.size()];
    if (member.failure.empty()) result.push_back(&member);
  }
  return result;
}

// Rounds over the members, until one has given a response that was taken; false: none did.
bool Members::race(const Request &request, const Deadline &deadline, const Take &take) {
  bool renewed = false;
  while (!deadline.passed()) {
    if (!token_ && !authenticate(deadline)) return false;
    const Outcome outcome = round(request, deadline, take);
    switch (outcome.end) {
      case Outcome::End::kTaken:
        return true;
      case Outcome::End::kNone:
        return false;
      case Outcome::End::kRefused:
        if (meaningOf(outcome.refusal, false) != Meaning::kToken) {
          refuse(request, outcome.refusal, outcome.url);
        }
        renewToken(request, outcome, &renewed);
        break;
    }
  }
  return false;
}

// One request sent to the usable members, each a hedge time after the one before it or when that
// one has failed.
class Members::Round {
 public:
  Round(Members &members, const Request &request, const Deadline &deadline)
      : members_(members), request_(request), deadline_(deadline), waiting_(members.usable()) {
    const auto count = static_cast<int64_t>(std::max<size_t>(waiting_.size(), 1));
    hedge_ = std::min(kHedge, deadline.left() / count);
  }
  Round(const Round &) = delete;
  Round &operator=(const Round &) = delete;
  ~Round() { members_.http_.cancelAll(); }

  struct Reply {
    Member *member;
    HttpResponse response;
  };

  // The member is asked again, after the others and after a pause.
  void askAgain(Member *member) {
    waiting_.push_back(member);
    pause_ = true;
  }

  // The next response of any member; empty: there will be none before the deadline.
  std::optional<Reply> next() {
    Deadline step(hedge_);
    while (!deadline_.passed()) {
      if (sent_.empty() && !waiting_.empty()) {
        if (pause_) std::this_thread::sleep_for(std::min(kPause, deadline_.left()));
        pause_ = false;
        send();
        step = Deadline(hedge_);
      }
      if (sent_.empty()) return std::nullopt;
      if (auto finished = members_.http_.wait(waiting_.empty() ? deadline_ : step)) {
        return reply(std::move(*finished));
      }
      if (!waiting_.empty() && !deadline_.passed()) send();
      step = Deadline(hedge_);
    }
    return std::nullopt;
  }

 private:
  void send() {
    Member *member = waiting_.front();
    waiting_.erase(waiting_.begin());
    HttpRequest http;
    http.url = member->url + request_.path;
    http.json = request_.json;
    http.token = members_.token_.value_or("");
    // Rounded to milliseconds, libcurl's limit could come before the round's own, and a member that
    // was only not asked long enough would count as one that failed.
    http.connect = http.whole = deadline_.left() + kGrace;
    http.maxBytes = request_.maxBytes;
    sent_.emplace_back(members_.http_.start(std::move(http)), member);
  }

  std::optional<Reply> reply(HttpClient::Finished finished) {
    for (auto sent = sent_.begin(); sent != sent_.end(); ++sent) {
      if (sent->first != finished.id) continue;
      Reply reply{sent->second, std::move(finished.response)};
      sent_.erase(sent);
      return reply;
    }
    return std::nullopt;
  }

  Members &members_;
  const Request &request_;
  const Deadline &deadline_;
  Milliseconds hedge_;
  bool pause_ = false;  // before the next member is asked
  std::vector<Member *> waiting_;
  std::vector<std::pair<HttpClient::Id, Member *>> sent_;
};

Members::Outcome Members::round(const Request &request, const Deadline &deadline,
                                const Take &take) {
  Round round(*this, request, deadline);
  Outcome outcome;
  while (auto reply = round.next()) {
    Member &member = *reply->member;
    try {
      checkCompleted(reply->response, member.url, request.subject);
      if (reply->response.status == 200) {
        takeOrFail(take, reply->response.body);
        preferred_ = static_cast<size_t>(&member - members_.data());
        outcome.end = Outcome::End::kTaken;
        return outcome;
      }
      const Refusal refusal = refusalOf(reply->response);
      const Meaning meaning = meaningOf(refusal, false);
      if (meaning == Meaning::kMember) throw MemberFailure(refusal.message, true);
      if (meaning != Meaning::kMoment) return {Outcome::End::kRefused, refusal, member.url};
      round.askAgain(&member);
    } catch (const MemberFailure &failure) {
      // libcurl's own time limit is the round's; such a member was only not asked long enough.
      if (deadline.passed()) continue;
      member.failure = failure.what();
      member.untrusted = failure.untrusted;
    }
  }
  return outcome;
}

void Members::change(const char *path, const std::string &json, const std::string &subject,
                     const Take &take) {
  if (!gone_.empty()) throw storeError(kWhere, subject, gone_);
  const Request request{path, json, subject, kMaxResponseBytes};
  const Deadline deadline(timeout_);
  for (auto left = usable(); !left.empty(); left = usable()) {
    const Milliseconds connect = deadline.left() / static_cast<int64_t>(left.size());
    if (changeThrough(*left.front(), request, connect, deadline, take)) return;
  }
  failUnavailable(subject);
}

// false: the member received nothing of the change.
bool Members::changeThrough(Member &member, const Request &request, Milliseconds connect,
                            const Deadline &deadline, const Take &take) {
  bool renewed = false;
  try {
    for (;;) {
      if (!token_ && !authenticate(deadline)) failUnavailable(request.subject);
      HttpRequest http{member.url + request.path, request.json,     *token_, connect,
                       deadline.left(),           request.maxBytes, true};
      const HttpResponse response = http_.post(std::move(http));
      checkCompleted(response, member.url, request.subject);
      if (response.status == 200) {
        takeOrFail(take, response.body);
        return true;
      }
      const Refusal refusal = refusalOf(response);
      switch (meaningOf(refusal, true)) {
        case Meaning::kMember:
          throw MemberFailure(refusal.message, true);
        case Meaning::kToken:
          renewToken(request, {Outcome::End::kRefused, refusal, member.url}, &renewed);
          break;
        default:
          refuse(request, refusal, member.url);
      }
    }
  } catch (const MemberFailure &failure) {
    member.failure = failure.what();
    member.untrusted = failure.untrusted;
    if (!failure.mayHaveActed) return false;
    throw storeError(member.url, request.subject,
                     member.failure + "; whether the change was made is not known");
  }
}

// Logs in at any member. false: no member responded. A wrong password is sent once.
bool Members::authenticate(const Deadline &deadline) {
  const std::string subject = "user \"" + user_ + "\"";
  std::string password = readPassword(passwordFile_);
  Request request{kAuthenticatePath, authenticateText(user_, password), subject, kMaxResponseBytes};
  token_ = "";  // sent with this request: none
  std::optional<std::string> token;
  const auto outcome = [&] {
    try {
      return round(request, deadline,
                   [&token](const std::string &json) { token = readToken(json); });
    } catch (...) {
      token_.reset();
      throw;
    }
  }();
  token_.reset();
  explicit_bzero(password.data(), password.size());
  explicit_bzero(request.json.data(), request.json.size());
  if (outcome.end == Outcome::End::kRefused) {
    if (meaningOf(outcome.refusal, false) != Meaning::kNoUsers) {
      giveUp(outcome.refusal.message + " (not asked again)");
      throw storeError(kWhere, subject, outcome.refusal.message);
    }
    token = "";
  }
  token_ = token;
  return token_.has_value();
}

void Members::renewToken(const Request &request, const Outcome &outcome, bool *renewed) {
  if (user_.empty()) {
    throw RequestRefused(RequestRefused::Why::kOther,
                         storeError(outcome.url, request.subject,
                                    outcome.refusal.message + " (the server requires a \"user\")")
                             .what());
  }
  if (*renewed) {
    giveUp(outcome.refusal.message + " (not asked again)");
    throw storeError(kWhere, "user \"" + user_ + "\"", outcome.refusal.message);
  }
  *renewed = true;
  token_.reset();
}

void Members::refuse(const Request &request, const Refusal &refusal, const std::string &url) {
  constexpr int64_t kPermissionDenied = 7;  // gRPC's number
  RequestRefused::Why why = RequestRefused::Why::kOther;
  if (meaningOf(refusal, false) == Meaning::kCompacted) why = RequestRefused::Why::kCompacted;
  if (refusal.code == kPermissionDenied) why = RequestRefused::Why::kPermission;
  throw RequestRefused(why, storeError(url, request.subject, describe(refusal)).what());
}

void Members::checkCluster(const Header &header) {
  if (!cluster_.empty() && header.cluster != cluster_) {
    throw ProtocolError("the member belongs to another cluster");
  }
  cluster_ = header.cluster;
}

void Members::markSilent(const std::string &why) {
  for (Member &member : members_) {
    if (member.failure.empty()) member.failure = why;
  }
}

void Members::failUnavailable(const std::string &subject) {
  const std::string why = "no member responds: " + failures();
  giveUp(why + " (not asked again)");
  unavailable_ = std::none_of(members_.begin(), members_.end(),
                              [](const Member &member) { return member.untrusted; });
  if (unavailable_) throw ClusterUnavailable(storeError(kWhere, subject, why).what());
  throw storeError(kWhere, subject, why);
}

std::string Members::failures() const {
  std::string text;
  for (const Member &member : members_) {
    text += (text.empty() ? "" : "; ") + member.url + ": " + member.failure;
  }
  return text;
}

Members::Health Members::health(const std::string &endpoint) {
  const auto start = Deadline::Clock::now();
  HttpRequest http{endpoint + kStatusPath, "{}", "", timeout_, timeout_, kMaxResponseBytes, false};
  const HttpResponse response = http_.post(std::move(http));
  const auto time = Deadline::Clock::now() - start;
  if (response.end != HttpResponse::End::kCompleted) {
    return {"does not respond: " + response.problem, ""};
  }
  try {
    if (response.status != 200) return {"refuses: " + describe(refusalOf(response)), ""};
    const StatusResponse status = readStatus(response.body);
    Health health{"etcd " + status.version + ", responds in " + inMilliseconds(time), ""};
    if (!status.hasLeader) health.problem = "has no leader";
    for (const std::string &error : status.errors) {
      health.problem += (health.problem.empty() ? "" : ", ") + error;
    }
    if (!health.problem.empty()) health.text += ", accepts no change: " + health.problem;
    return health;
  } catch (const ProtocolError &error) {
    return {std::string("the response is not etcd's: ") + error.what(), ""};
  } catch (const MemberFailure &failure) {
    return {std::string("refuses: ") + failure.what(), ""};
  }
}

}  // namespace Kestrel::Etcd
