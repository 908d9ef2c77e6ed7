// SPDX-License-Identifier: Apache-2.0
// The engine of each configuration, and the report on it.
#include "kestrel/open.h"

#include <algorithm>
#include <system_error>

#include "common/read_file.h"
#include "kestrel/module.h"
#include "kestrel/sqlite_backend.h"
#include "kestrel/text.h"

namespace Kestrel {

namespace {

using KestrelConfigStore::ConfigStoreException;

constexpr const char *kEtcdModule = "libkestrel-etcd.so.1";
constexpr size_t kMaxLastRunBytes = 65536;

void describe(const Configuration &configuration, Report *report) {
  const bool sqlite = configuration.engine == Engine::kSqlite;
  const std::string file = configuration.file;
  report->details = {
      {"configuration", configuration.fileExists ? file : file + " (missing; defaults are used)"},
      {"store", sqlite ? "sqlite" : "etcd"},
      {"location", sqlite ? configuration.path : joined(configuration.endpoints)},
  };
}

// What the last run of any program on this host took from the store.
void describeLastRun(const Configuration &configuration, Report *report) {
  if (configuration.lastRun.empty()) return;
  std::string text;
  try {
    text = Platform::readFile(configuration.lastRun, kMaxLastRunBytes);
  } catch (const std::system_error &error) {
    report->details.emplace_back("last run", configuration.lastRun + ": " + error.code().message());
    return;
  }
  for (size_t at = 0; at < text.size();) {
    const size_t end = std::min(text.find('\n', at), text.size());
    report->details.emplace_back("last run", text.substr(at, end - at));
    at = end + 1;
  }
}

Condition look(Report *report) {
  report->details = {{"configuration", configurationFile()}};
  const Configuration configuration = readConfiguration();
  describe(configuration, report);
  describeLastRun(configuration, report);
  const auto backend = openBackend(configuration, Access::kRead);
  if (!backend) {
    report->problem = configuration.path + ": there is no such file";
    return Condition::kMissing;
  }
  Health health = backend->health();
  for (Detail &detail : health.details) report->details.push_back(std::move(detail));
  report->problem = health.problem;
  if (!health.readable) return Condition::kUnusable;
  return health.problem.empty() ? Condition::kUsable : Condition::kLimited;
}

}  // namespace

std::shared_ptr<Backend> openBackend(const Configuration &configuration, Access access) {
  if (configuration.engine == Engine::kEtcd) return openModule(kEtcdModule, "etcd", configuration);
  return openSqliteBackend(configuration, access);
}

std::shared_ptr<Backend> openBackend(Access access) {
  return openBackend(readConfiguration(), access);
}

Report inspect() {
  Report report;
  try {
    report.condition = look(&report);
  } catch (const ConfigStoreException &error) {
    report.condition = Condition::kUnusable;
    report.problem = error.what();
  }
  return report;
}

}  // namespace Kestrel
