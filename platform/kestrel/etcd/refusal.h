// SPDX-License-Identifier: Apache-2.0
// What a refusal of etcd's means for the one who asked.
#pragma once

#include "kestrel/etcd/protocol.h"

namespace Kestrel::Etcd {

enum class Meaning {
  kMember,     // this member cannot answer; another one may
  kToken,      // the token has expired, or there is none where one is wanted
  kBehind,     // the member has not seen the asked revision yet
  kCompacted,  // no member knows the asked revision any more
  kNoUsers,    // the server has no authentication
  kRefused,    // the answer is no, and no member would say anything else
};

// change: the request would have changed the store.
Meaning meaningOf(const Refusal &refusal, bool change);

// The server's words, with the name of the option that sets the limit where it is one.
std::string describe(const Refusal &refusal);

}  // namespace Kestrel::Etcd
