// SPDX-License-Identifier: Apache-2.0
// /etc/kestrel.conf, or the file that KESTREL_CONF names: which store this host uses, and where.
// The file is read strictly; whatever it gets wrong is a ConfigStoreException with file and line.
#pragma once

#include <chrono>
#include <string>
#include <vector>

namespace Kestrel {

enum class Engine { kSqlite, kEtcd };

struct Configuration {
  std::string file;        // the configuration file that holds
  bool fileExists = true;  // false: there is none, and everything below is the default

  Engine engine = Engine::kSqlite;
  std::string path;  // the SQLite file

  std::vector<std::string> endpoints;
  std::string prefix = "/kestrel";
  std::string cacert, cert, key, user, passwordFile;

  std::chrono::milliseconds timeout{1000};  // the longest that one lookup may take in all

  bool operator==(const Configuration &other) const;
};

// The configuration file's path. KESTREL_CONF is ignored in a process that got its rights from its
// program file.
std::string configurationFile();

// The default file is allowed to be missing, one that KESTREL_CONF names is not.
Configuration readConfiguration();

}  // namespace Kestrel
