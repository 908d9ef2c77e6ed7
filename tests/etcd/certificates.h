// SPDX-License-Identifier: Apache-2.0
// Certificates for one test, made with openssl: an authority, servers' and clients' certificates
// for the test's own address, right ones and expired ones.
#pragma once

#include <filesystem>
#include <string>

namespace Test {

struct Certificate {
  std::string cert, key;  // files
};

class Authority {
 public:
  // Makes the authority's own certificate in a new folder FOLDER/NAME.
  Authority(const std::filesystem::path &folder, const std::string &name);

  std::string cert() const;

  enum class Validity { kNow, kOver };

  // address: the IP address that the certificate is for. It has no common name: a server with users
  // takes no such client over HTTP.
  Certificate issue(const std::string &name, const std::string &address,
                    Validity validity = Validity::kNow) const;

 private:
  std::filesystem::path folder_;
};

}  // namespace Test
