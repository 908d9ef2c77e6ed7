// SPDX-License-Identifier: Apache-2.0
// Base64, the form in which etcd's HTTP/JSON gateway takes and gives keys and values.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace Kestrel::Etcd {

std::string toBase64(std::string_view bytes);

// Nothing: the text is no base64 with its padding.
std::optional<std::string> fromBase64(std::string_view text);

}  // namespace Kestrel::Etcd
