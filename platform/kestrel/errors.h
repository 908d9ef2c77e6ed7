// SPDX-License-Identifier: Apache-2.0
// The one place where an error of the store gets its words: which thing, what was tried, why not.
#pragma once

#include <string>
#include <string_view>

#include "platform/kestrel_config_store.h"

namespace Kestrel {

// "PLACE: WHY", or "PLACE: WHAT: WHY".
inline KestrelConfigStore::ConfigStoreException storeError(std::string_view place,
                                                           std::string_view why) {
  return KestrelConfigStore::ConfigStoreException(std::string(place) + ": " + std::string(why));
}

inline KestrelConfigStore::ConfigStoreException storeError(std::string_view place,
                                                           std::string_view what,
                                                           std::string_view why) {
  return storeError(place, std::string(what) + ": " + std::string(why));
}

}  // namespace Kestrel
