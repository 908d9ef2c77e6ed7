// SPDX-License-Identifier: Apache-2.0
// /etc/kestrel.conf, or the file that KESTREL_CONF names: which store this host uses, and where.
// The file is read strictly: anything wrong in it is a ConfigStoreException with file and line.
#pragma once

#include <chrono>
#include <string>
#include <vector>

namespace Kestrel {

enum class Engine { kSqlite, kEtcd };

struct Configuration {
  std::string file;        // the configuration file
  bool fileExists = true;  // false: there is none, and everything below has its default

  Engine engine = Engine::kSqlite;
  std::string path;  // the SQLite file

  std::vector<std::string> endpoints;
  // The layers, from the most to the least particular, with %H and %L replaced.
  std::vector<std::string> prefixes = {"/kestrel"};
  std::string cacert, cert, key, user, passwordFile;

  std::chrono::milliseconds timeout{1000};     // the longest time for one lookup
  std::chrono::milliseconds runTimeout{3000};  // the longest time for all lookups of a run together

  std::string snapshot;                    // the file of the last known good values; empty: none
  std::chrono::seconds maxAge{7 * 86400};  // older values are not used
  std::string lastRun;                     // the file that describes the last run; empty: none
};

// What %H and %L in "prefix" become.
struct HostNames {
  std::string host;   // empty: this host
  std::string label;  // empty: none; for this host, the file's
};

// The configuration file's path. KESTREL_CONF is ignored in a process that got its rights from its
// program file.
std::string configurationFile();

// The default file is allowed to be missing, one that KESTREL_CONF names is not. names: the host to
// read it for; null: this one.
Configuration readConfiguration(const HostNames *names = nullptr);

}  // namespace Kestrel
