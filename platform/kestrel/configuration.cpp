// SPDX-License-Identifier: Apache-2.0
// Keys, defaults and checks of the configuration file. The form of the file is KeyValueFile's.
#include "kestrel/configuration.h"

#include <pwd.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <initializer_list>
#include <optional>
#include <string_view>
#include <tuple>

#include "common/key_value_file.h"
#include "kestrel/errors.h"

namespace Kestrel {

namespace {

constexpr const char *kDefaultFile = "/etc/kestrel.conf";
constexpr const char *kRootStore = "/var/lib/kestrel/store.db";
constexpr int64_t kMaxTimeoutMs = 3600000;  // an hour
const std::initializer_list<std::string_view> kKeys = {
    "store", "path", "endpoints", "prefix",        "cacert",
    "cert",  "key",  "user",      "password-file", "timeout-ms"};

// A variable that holds an absolute path; anything else counts as not set.
std::optional<std::string> absoluteVariable(const char *name) {
  const char *value = secure_getenv(name);
  if (value == nullptr || value[0] != '/') return std::nullopt;
  return value;
}

std::string homeFolder() {
  if (const auto home = absoluteVariable("HOME")) return *home;
  const passwd *entry = getpwuid(geteuid());
  if (entry == nullptr || entry->pw_dir == nullptr) {
    throw storeError("kestrel", "no home folder for the store; set \"path\" in kestrel.conf");
  }
  return entry->pw_dir;
}

std::string defaultPath() {
  if (geteuid() == 0) return kRootStore;
  const auto data = absoluteVariable("XDG_DATA_HOME");
  return (data ? *data : homeFolder() + "/.local/share") + "/kestrel/store.db";
}

// endpoint = ( "http://" | "https://" ) host [ ":" port ], without a path
bool isEndpoint(std::string_view text) {
  for (const std::string_view scheme : {"http://", "https://"}) {
    if (text.substr(0, scheme.size()) != scheme) continue;
    const std::string_view host = text.substr(scheme.size());
    return !host.empty() && host.find_first_of("/ \t?#@") == std::string_view::npos;
  }
  return false;
}

std::vector<std::string> readEndpoints(const Platform::KeyValueFile &file) {
  std::vector<std::string> endpoints;
  const std::string list = file.text("endpoints").value_or("");
  for (size_t at = 0; !list.empty() && at <= list.size();) {
    const size_t comma = std::min(list.find(',', at), list.size());
    const size_t first = std::min(list.find_first_not_of(" \t", at), comma);
    const size_t end = list.find_last_not_of(" \t", comma == 0 ? 0 : comma - 1) + 1;
    const std::string endpoint = list.substr(first, end > first ? end - first : 0);
    if (!isEndpoint(endpoint)) {
      file.refuse("endpoints",
                  "bad value \"" + endpoint + "\" (http://HOST[:PORT] or https://HOST[:PORT])");
    }
    endpoints.push_back(endpoint);
    at = comma + 1;
  }
  return endpoints;
}

std::string readPrefix(const Platform::KeyValueFile &file, const std::string &otherwise) {
  std::string prefix = file.absolutePath("prefix").value_or(otherwise);
  if (prefix.back() == '/') file.refuse("prefix", "bad value \"" + prefix + "\" (ends with '/')");
  return prefix;
}

void readEtcd(const Platform::KeyValueFile &file, Configuration *result) {
  result->endpoints = readEndpoints(file);
  result->prefix = readPrefix(file, result->prefix);
  result->cacert = file.absolutePath("cacert").value_or("");
  result->cert = file.absolutePath("cert").value_or("");
  result->key = file.absolutePath("key").value_or("");
  result->user = file.text("user").value_or("");
  result->passwordFile = file.absolutePath("password-file").value_or("");
  if (result->engine == Engine::kEtcd && result->endpoints.empty()) {
    file.refuse("store", "etcd needs \"endpoints\"");
  }
  if (!result->cert.empty() && result->key.empty()) file.refuse("cert", "needs \"key\"");
  if (!result->key.empty() && result->cert.empty()) file.refuse("key", "needs \"cert\"");
  if (!result->user.empty() && result->passwordFile.empty()) {
    file.refuse("user", "needs \"password-file\"");
  }
  if (!result->passwordFile.empty() && result->user.empty()) {
    file.refuse("password-file", "needs \"user\"");
  }
}

void readKeys(const Platform::KeyValueFile &file, Configuration *result) {
  const auto store = file.oneOf("store", {"sqlite", "etcd"});
  result->engine = store == "etcd" ? Engine::kEtcd : Engine::kSqlite;
  result->path = file.absolutePath("path").value_or("");
  if (const auto timeout = file.integer("timeout-ms", 1, kMaxTimeoutMs)) {
    result->timeout = std::chrono::milliseconds(*timeout);
  }
  readEtcd(file, result);
}

}  // namespace

bool Configuration::operator==(const Configuration &other) const {
  const auto all = [](const Configuration &c) {
    return std::tie(c.file, c.fileExists, c.engine, c.path, c.endpoints, c.prefix, c.cacert, c.cert,
                    c.key, c.user, c.passwordFile, c.timeout);
  };
  return all(*this) == all(other);
}

std::string configurationFile() {
  const char *named = secure_getenv("KESTREL_CONF");
  return named == nullptr || *named == '\0' ? kDefaultFile : named;
}

Configuration readConfiguration() {
  Configuration result;
  result.file = configurationFile();
  try {
    const auto file = Platform::KeyValueFile::read(result.file, kKeys);
    result.fileExists = file.has_value();
    if (file) readKeys(*file, &result);
  } catch (const Platform::ConfigError &error) {
    throw KestrelConfigStore::ConfigStoreException(error.what());
  }
  if (!result.fileExists && result.file != kDefaultFile) {
    throw storeError(result.file, "no such file, but KESTREL_CONF names it");
  }
  if (result.path.empty() && result.engine == Engine::kSqlite) result.path = defaultPath();
  return result;
}

}  // namespace Kestrel
