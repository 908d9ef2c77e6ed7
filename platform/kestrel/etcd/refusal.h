// SPDX-License-Identifier: Apache-2.0
// What a refusal by etcd means for the request.
#pragma once

#include "kestrel/etcd/protocol.h"

namespace Kestrel::Etcd {

enum class Meaning {
  kMember,     // this member cannot respond; another one may
  kMoment,     // this member, or the cluster, needs a moment; it may be asked again
  kToken,      // the token has expired, or one is missing
  kCompacted,  // no member has the requested revision any more
  kNoUsers,    // the server has no authentication
  kRefused,    // every member would refuse the request
};

// change: the request would have changed the store.
Meaning meaningOf(const Refusal &refusal, bool change);

// The server's text; where it names a limit, with the option that sets it.
std::string describe(const Refusal &refusal);

}  // namespace Kestrel::Etcd
