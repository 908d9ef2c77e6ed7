// SPDX-License-Identifier: Apache-2.0
// The password of etcd's user, from a file that only its owner may read or write.
#pragma once

#include <string>

namespace Kestrel::Etcd {

// The file's one line. Throws a ConfigStoreException, which never holds anything of the content:
// no such file, not a regular file, others than its owner may read or write it, empty, more than
// one line.
std::string readPassword(const std::string &path);

}  // namespace Kestrel::Etcd
