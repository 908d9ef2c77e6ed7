// SPDX-License-Identifier: Apache-2.0
// Which engine stands behind a configuration, and what can be said of it without using it.
#include "kestrel/open.h"

#include <array>
#include <chrono>
#include <cstdio>

#include "kestrel/module.h"
#include "kestrel/sqlite_backend.h"

namespace Kestrel {

namespace {

using KestrelConfigStore::ConfigStoreException;

constexpr const char *kEtcdModule = "libkestrel-etcd.so.1";

std::string joined(const std::vector<std::string> &words) {
  std::string text;
  for (const std::string &word : words) text += (text.empty() ? "" : ", ") + word;
  return text;
}

void describe(const Configuration &configuration, Report *report) {
  const bool sqlite = configuration.engine == Engine::kSqlite;
  const std::string file = configuration.file;
  report->details = {
      {"configuration", configuration.fileExists ? file : file + " (missing; the defaults hold)"},
      {"store", sqlite ? "sqlite" : "etcd"},
      {"place", sqlite ? configuration.path : joined(configuration.endpoints)},
  };
}

std::string milliseconds(std::chrono::steady_clock::duration time) {
  std::array<char, 64> text{};
  const double value = std::chrono::duration<double, std::milli>(time).count();
  (void)std::snprintf(text.data(), text.size(), "%.2f ms", value);
  return text.data();
}

// A lookup of an id that no object has: what it costs to be answered.
std::string responseTime(Backend &backend) {
  const auto start = std::chrono::steady_clock::now();
  (void)backend.read(ObjectId{});
  return milliseconds(std::chrono::steady_clock::now() - start);
}

Condition look(Report *report) {
  report->details = {{"configuration", configurationFile()}};
  const Configuration configuration = readConfiguration();
  describe(configuration, report);
  const auto backend = openBackend(configuration, Access::kRead);
  if (!backend) {
    report->problem = configuration.path + ": there is no such file";
    return Condition::kMissing;
  }
  for (const Detail &detail : backend->details()) report->details.push_back(detail);
  report->details.emplace_back("answers in", responseTime(*backend));
  return Condition::kUsable;
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
