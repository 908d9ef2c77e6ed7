// SPDX-License-Identifier: Apache-2.0
// One row for each refusal that has a meaning of its own. gRPC's number comes first; where etcd
// uses one number for several refusals, only its text distinguishes them.
#include "kestrel/etcd/refusal.h"

#include <string_view>

namespace Kestrel::Etcd {

namespace {

// gRPC's numbers.
constexpr int64_t kCancelled = 1;
constexpr int64_t kUnknown = 2;
constexpr int64_t kInvalidArgument = 3;
constexpr int64_t kDeadlineExceeded = 4;
constexpr int64_t kResourceExhausted = 8;
constexpr int64_t kFailedPrecondition = 9;
constexpr int64_t kOutOfRange = 11;
constexpr int64_t kUnimplemented = 12;
constexpr int64_t kInternal = 13;
constexpr int64_t kUnavailable = 14;
constexpr int64_t kUnauthenticated = 16;

struct Row {
  int64_t code;
  std::string_view text;  // part of the message; empty: any
  Meaning meaning;
};

constexpr Row kRows[] = {
    {kCancelled, "", Meaning::kMember},
    {kUnknown, "", Meaning::kMember},
    {kInvalidArgument, "user name is empty", Meaning::kToken},
    {kInvalidArgument, "revision of auth store is old", Meaning::kToken},
    {kDeadlineExceeded, "", Meaning::kMember},
    {kFailedPrecondition, "authentication is not enabled", Meaning::kNoUsers},
    {kOutOfRange, "has been compacted", Meaning::kCompacted},
    {kOutOfRange, "is a future revision", Meaning::kMoment},
    {kUnimplemented, "", Meaning::kMember},
    {kInternal, "", Meaning::kMember},
    {kUnavailable, "leader changed", Meaning::kMoment},
    {kUnavailable, "no leader", Meaning::kMoment},
    {kUnavailable, "request timed out", Meaning::kMoment},
    {kUnavailable, "", Meaning::kMember},
    {kUnauthenticated, "", Meaning::kToken},
};

struct Limit {
  std::string_view text;
  const char *option;
};

constexpr Limit kLimits[] = {
    {"too many operations in txn request", "--max-txn-ops"},
    {"request is too large", "--max-request-bytes"},
    {"database space exceeded", "--quota-backend-bytes"},
};

bool contains(const std::string &text, std::string_view part) {
  return text.find(part) != text.npos;
}

}  // namespace

Meaning meaningOf(const Refusal &refusal, bool change) {
  // A full store refuses changes; a member with too much to do refuses anything.
  if (refusal.code == kResourceExhausted) return change ? Meaning::kRefused : Meaning::kMember;
  for (const Row &row : kRows) {
    if (row.code != refusal.code || !contains(refusal.message, row.text)) continue;
    // A change that was begun may still be made: it is not sent again.
    return change && row.meaning == Meaning::kMoment ? Meaning::kMember : row.meaning;
  }
  return Meaning::kRefused;
}

std::string describe(const Refusal &refusal) {
  for (const Limit &limit : kLimits) {
    if (contains(refusal.message, limit.text)) {
      return refusal.message + " (the server's " + limit.option + ")";
    }
  }
  return refusal.message;
}

}  // namespace Kestrel::Etcd
