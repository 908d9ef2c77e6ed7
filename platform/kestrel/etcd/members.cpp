// SPDX-License-Identifier: Apache-2.0
// Who is asked, for how long, and what is made of the answers. What the answers hold is the
// caller's business.
#include "kestrel/etcd/members.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <stdexcept>
#include <string_view>
#include <thread>

#include "kestrel/errors.h"
#include "kestrel/etcd/password_file.h"
#include "kestrel/etcd/refusal.h"

namespace Kestrel::Etcd {

namespace {

constexpr const char *kPlace = "etcd";

// A member that lags behind by more than this many pauses is as good as dead.
constexpr int kMaxPauses = 100;
constexpr std::chrono::milliseconds kPause{10};

// What keeps one member from answering.
class MemberFailure : public std::runtime_error {
 public:
  MemberFailure(const std::string &why, bool mayHaveActedThere)
      : std::runtime_error(why), mayHaveActed(mayHaveActedThere) {}
  const bool mayHaveActed;
};

// etcd itself says this as a plain text, before anything else has looked at the request.
constexpr std::string_view kCommonName = "CommonName of client";

Refusal refusalOf(const HttpResponse &response) {
  try {
    if (auto refusal = readRefusal(response.body)) return std::move(*refusal);
  } catch (const ProtocolError &) {
    // As good as any other text.
  }
  if (response.body.compare(0, kCommonName.size(), kCommonName) == 0) {
    throw MemberFailure("it has users, and then takes no client certificate with a common name",
                        false);
  }
  throw MemberFailure("HTTP status " + std::to_string(response.status) + ", and no word of etcd's",
                      true);
}

void readOrFail(const Members::Read &read, const std::string &json) {
  try {
    read(json);
  } catch (const ProtocolError &error) {
    throw MemberFailure(std::string("the answer is not etcd's: ") + error.what(), true);
  }
}

std::string milliseconds(Deadline::Clock::duration time) {
  std::array<char, 64> text{};
  const double value = std::chrono::duration<double, std::milli>(time).count();
  (void)std::snprintf(text.data(), text.size(), "%.2f ms", value);
  return text.data();
}

}  // namespace

Members::Members(const Configuration &configuration)
    : endpoints_(configuration.endpoints),
      timeout_(configuration.timeout),
      user_(configuration.user),
      passwordFile_(configuration.passwordFile),
      http_(configuration) {
  for (const std::string &endpoint : endpoints_) members_.push_back({endpoint, ""});
  if (user_.empty()) token_ = "";
}

void Members::ask(const Request &request, const Read &read) {
  if (!gone_.empty()) throw storeError(kPlace, request.subject, gone_);
  const Deadline whole(timeout_);
  for (auto left = usable(); !left.empty(); left = usable()) {
    Member &member = *left.front();
    try {
      const Deadline part(whole.left() / static_cast<int64_t>(left.size()));
      return attempt(member, request, read, part, whole);
    } catch (const MemberFailure &failure) {
      member.failure = failure.what();
      if (request.kind == Request::Kind::kChange && failure.mayHaveActed) {
        throw storeError(member.url, request.subject,
                         member.failure + "; whether the change was made is not known");
      }
    }
  }
  giveUpAndThrow(request.subject, "no member answers: " + failures());
}

std::vector<Members::Member *> Members::usable() {
  std::vector<Member *> result;
  for (Member &member : members_) {
    if (member.failure.empty()) result.push_back(&member);
  }
  return result;
}

void Members::attempt(const Member &member, const Request &request, const Read &read,
                      const Deadline &part, const Deadline &whole) {
  const bool change = request.kind == Request::Kind::kChange;
  bool renewed = false;
  for (int pauses = 0;;) {
    if (!token_) authenticate(member, part);
    const HttpResponse response =
        send(member, request, {part.left(), change ? whole.left() : part.left()});
    if (response.status == 200) return readOrFail(read, response.body);

    const Refusal refusal = refusalOf(response);
    switch (meaningOf(refusal, change)) {
      case Meaning::kToken:
        renewToken(member, request, refusal, &renewed);
        continue;
      case Meaning::kBehind:
        if (++pauses > kMaxPauses || part.passed()) {
          throw MemberFailure("it lags behind: " + refusal.message, false);
        }
        std::this_thread::sleep_for(std::min(kPause, part.left()));
        continue;
      case Meaning::kMember:
        throw MemberFailure(refusal.message, true);
      case Meaning::kCompacted:
        throw RequestRefused(RequestRefused::Why::kCompacted, refusal.message);
      case Meaning::kNoUsers:
      case Meaning::kRefused:
        throw RequestRefused(RequestRefused::Why::kOther,
                             storeError(member.url, request.subject, describe(refusal)).what());
    }
  }
}

HttpResponse Members::send(const Member &member, const Request &request, TimeLimits limits) {
  HttpResponse response = http_.post(member.url + request.path, request.json, token_.value_or(""),
                                     limits, kMaxResponseBytes);
  if (response.end == HttpResponse::End::kCompleted) return response;
  if (response.end == HttpResponse::End::kTooLarge && request.kind == Request::Kind::kPage) {
    throw RequestRefused(RequestRefused::Why::kTooLargeResponse,
                         storeError(member.url, request.subject, response.problem).what());
  }
  throw MemberFailure(response.problem, response.end != HttpResponse::End::kNotReached);
}

void Members::authenticate(const Member &member, const Deadline &part) {
  const std::string subject = "user \"" + user_ + "\"";
  const std::string password = readPassword(passwordFile_);
  const Request request{Request::Kind::kRead, kAuthenticatePath, authenticateText(user_, password),
                        subject};
  token_ = "";
  const HttpResponse response = [&] {
    try {
      return send(member, request, {part.left(), part.left()});
    } catch (...) {
      token_.reset();
      throw;
    }
  }();
  token_.reset();
  if (response.status == 200) {
    return readOrFail([this](const std::string &json) { token_ = readToken(json); }, response.body);
  }
  const Refusal refusal = refusalOf(response);
  switch (meaningOf(refusal, false)) {
    case Meaning::kNoUsers:
      token_ = "";
      return;
    case Meaning::kMember:
      throw MemberFailure(refusal.message, false);
    default:
      giveUpAndThrow(subject, refusal.message);
  }
}

void Members::renewToken(const Member &member, const Request &request, const Refusal &refusal,
                         bool *renewed) {
  if (user_.empty()) {
    throw RequestRefused(
        RequestRefused::Why::kOther,
        storeError(member.url, request.subject, refusal.message + " (the server wants a \"user\")")
            .what());
  }
  if (*renewed) giveUpAndThrow("user \"" + user_ + "\"", refusal.message);
  *renewed = true;
  token_.reset();
}

void Members::giveUpAndThrow(const std::string &subject, const std::string &why) {
  giveUp(why + " (not asked again)");
  throw storeError(kPlace, subject, why);
}

std::string Members::failures() const {
  std::string text;
  for (const Member &member : members_) {
    text += (text.empty() ? "" : "; ") + member.url + ": " + member.failure;
  }
  return text;
}

std::string Members::condition(const std::string &endpoint) {
  const auto start = Deadline::Clock::now();
  const HttpResponse response =
      http_.post(endpoint + kStatusPath, "{}", "", {timeout_, timeout_}, kMaxResponseBytes);
  const auto time = Deadline::Clock::now() - start;
  if (response.end != HttpResponse::End::kCompleted) return "does not answer: " + response.problem;
  try {
    if (response.status != 200) return "answers: " + describe(refusalOf(response));
    const StatusResponse status = readStatus(response.body);
    return "etcd " + status.version + ", answers in " + milliseconds(time) +
           (status.hasLeader ? "" : ", has no leader: takes no change");
  } catch (const ProtocolError &error) {
    return std::string("the answer is not etcd's: ") + error.what();
  } catch (const MemberFailure &failure) {
    return std::string("answers: ") + failure.what();
  }
}

}  // namespace Kestrel::Etcd
