// SPDX-License-Identifier: Apache-2.0
// The one place where an error of the store gets its text: what was used, what was tried, why it
// failed. Control characters, such as those of a server's text, are escaped.
#pragma once

#include <string>
#include <string_view>

#include "kestrel/text.h"
#include "platform/kestrel_config_store.h"

namespace Kestrel {

// "WHERE: WHY", or "WHERE: WHAT: WHY".
inline KestrelConfigStore::ConfigStoreException storeError(std::string_view where,
                                                           std::string_view why) {
  return KestrelConfigStore::ConfigStoreException(
      escaped(std::string(where) + ": " + std::string(why)));
}

inline KestrelConfigStore::ConfigStoreException storeError(std::string_view where,
                                                           std::string_view what,
                                                           std::string_view why) {
  return storeError(where, std::string(what) + ": " + std::string(why));
}

}  // namespace Kestrel
