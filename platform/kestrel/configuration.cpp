// SPDX-License-Identifier: Apache-2.0
// Keys, defaults and checks of the configuration file. The form of the file is KeyValueFile's.
#include "kestrel/configuration.h"

#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <cstdlib>
#include <initializer_list>
#include <optional>
#include <string_view>
#include <utility>

#include "common/key_value_file.h"
#include "kestrel/errors.h"

namespace Kestrel {

namespace {

constexpr const char *kDefaultFile = "/etc/kestrel.conf";
constexpr const char *kRootStore = "/var/lib/kestrel/store.db";
constexpr const char *kRootSnapshot = "/var/lib/kestrel/snapshot";
constexpr const char *kRootLastRun = "/run/kestrel/last";
constexpr int64_t kMaxTimeoutMs = 3600000;  // an hour
constexpr int kRunTimeouts = 3;             // the default of run-timeout-ms, in timeout-ms
constexpr size_t kMaxLayers = 16;           // etcd accepts 128 operations in a transaction
const std::initializer_list<std::string_view> kKeys = {
    "store",      "path",           "endpoints", "prefix",   "label",
    "cacert",     "cert",           "key",       "user",     "password-file",
    "timeout-ms", "run-timeout-ms", "max-age",   "snapshot", "last-run"};

// A variable that holds an absolute path; any other content counts as not set.
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

// The parts between commas, without the blanks around them. A part may be empty.
std::vector<std::string> listOf(const std::string &text) {
  std::vector<std::string> parts;
  for (size_t at = 0; !text.empty() && at <= text.size();) {
    const size_t comma = std::min(text.find(',', at), text.size());
    const size_t first = std::min(text.find_first_not_of(" \t", at), comma);
    const size_t end = text.find_last_not_of(" \t", comma == 0 ? 0 : comma - 1) + 1;
    parts.push_back(text.substr(first, end > first ? end - first : 0));
    at = comma + 1;
  }
  return parts;
}

std::vector<std::string> readEndpoints(const Platform::KeyValueFile &file) {
  std::vector<std::string> endpoints = listOf(file.text("endpoints").value_or(""));
  for (const std::string &endpoint : endpoints) {
    if (isEndpoint(endpoint)) continue;
    file.refuse("endpoints",
                "bad value \"" + endpoint + "\" (http://HOST[:PORT] or https://HOST[:PORT])");
  }
  return endpoints;
}

std::string hostName() {
  std::array<char, 256> name{};
  if (gethostname(name.data(), name.size() - 1) != 0) return {};
  return name.data();
}

// A name that can be one part of a path.
bool isPathPart(const std::string &name) {
  return !name.empty() && name != "." && name != ".." &&
         name.find_first_not_of(
             "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789"
             "-._") == name.npos;
}

std::string expanded(const Platform::KeyValueFile &file, const std::string &prefix,
                     const HostNames &names) {
  std::string result;
  for (size_t at = 0; at < prefix.size(); ++at) {
    if (prefix[at] != '%') {
      result += prefix[at];
      continue;
    }
    const char letter = ++at < prefix.size() ? prefix[at] : '\0';
    if (letter == '%') {
      result += '%';
    } else if (letter == 'H') {
      if (!isPathPart(names.host)) {
        file.refuse("prefix", "%H: the host's name \"" + names.host + "\" cannot be part of a key");
      }
      result += names.host;
    } else if (letter == 'L') {
      if (names.label.empty()) file.refuse("prefix", "%L needs \"label\"");
      if (!isPathPart(names.label)) {
        file.refuse("prefix", "%L: the label \"" + names.label + "\" cannot be part of a key");
      }
      result += names.label;
    } else {
      file.refuse("prefix", "bad value \"" + prefix + "\" (after '%' only H, L or %)");
    }
  }
  return result;
}

std::vector<std::string> readPrefixes(const Platform::KeyValueFile &file, const HostNames &names,
                                      const std::vector<std::string> &otherwise) {
  const auto text = file.text("prefix");
  if (!text) return otherwise;
  std::vector<std::string> prefixes;
  for (const std::string &part : listOf(*text)) {
    if (part.empty() || part.front() != '/') {
      file.refuse("prefix", "bad value \"" + part + "\" (a path that begins with '/')");
    }
    if (part.back() == '/') file.refuse("prefix", "bad value \"" + part + "\" (ends with '/')");
    prefixes.push_back(expanded(file, part, names));
    if (std::count(prefixes.begin(), prefixes.end(), prefixes.back()) > 1) {
      file.refuse("prefix", "\"" + prefixes.back() + "\" is given twice");
    }
  }
  if (prefixes.size() > kMaxLayers) {
    file.refuse("prefix", "more than " + std::to_string(kMaxLayers) + " layers");
  }
  return prefixes;
}

// age = digits ( "s" | "m" | "h" | "d" )
std::optional<std::chrono::seconds> readAge(const Platform::KeyValueFile &file, const char *key) {
  constexpr std::array<std::pair<char, int64_t>, 4> kUnits = {
      {{'s', 1}, {'m', 60}, {'h', 3600}, {'d', 86400}}};
  constexpr int64_t kMaxAge = int64_t{10} * 366 * 86400;
  const auto text = file.text(key);
  if (!text) return std::nullopt;
  int64_t number = -1;
  const char *end = text->data() + text->size() - 1;
  const auto result = std::from_chars(text->data(), end, number);
  for (const auto &[letter, seconds] : kUnits) {
    if (*end != letter || result.ec != std::errc() || result.ptr != end) continue;
    if (number >= 0 && number <= kMaxAge / seconds) return std::chrono::seconds(number * seconds);
  }
  file.refuse(key, "bad value \"" + *text + "\" (a time such as 90s, 30m, 12h or 7d)");
}

// A password would travel in clear, for anyone on the way to read.
void refusePasswordInClear(const Platform::KeyValueFile &file, const Configuration &result) {
  if (result.user.empty()) return;
  for (const std::string &endpoint : result.endpoints) {
    if (endpoint.compare(0, 8, "https://") == 0) continue;
    file.refuse("user", "a password is sent only to https:// endpoints, not to " + endpoint);
  }
}

// This host's names, unless others are given. The label of another host is not known from here.
HostNames hostNames(const Platform::KeyValueFile &file, const HostNames *given) {
  HostNames names{hostName(), file.text("label").value_or("")};
  if (!names.label.empty() && !isPathPart(names.label)) {
    file.refuse("label", "bad value \"" + names.label + "\" (letters, digits, '-', '.' and '_')");
  }
  if (given == nullptr) return names;
  if (!given->host.empty()) return *given;
  if (!given->label.empty()) names.label = given->label;
  return names;
}

void readEtcd(const Platform::KeyValueFile &file, const HostNames &names, Configuration *result) {
  result->endpoints = readEndpoints(file);
  result->prefixes = readPrefixes(file, names, result->prefixes);
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
  refusePasswordInClear(file, *result);
}

// The files that the library writes. Only root has a place for them that outlives a run.
void readStateFiles(const Platform::KeyValueFile &file, Configuration *result) {
  const bool root = geteuid() == 0;
  const bool etcd = result->engine == Engine::kEtcd;
  result->snapshot = file.absolutePath("snapshot").value_or(root && etcd ? kRootSnapshot : "");
  result->lastRun = file.absolutePath("last-run").value_or(root && etcd ? kRootLastRun : "");
  result->maxAge = readAge(file, "max-age").value_or(result->maxAge);
}

void readKeys(const Platform::KeyValueFile &file, const HostNames *names, Configuration *result) {
  const auto store = file.oneOf("store", {"sqlite", "etcd"});
  result->engine = store == "etcd" ? Engine::kEtcd : Engine::kSqlite;
  result->path = file.absolutePath("path").value_or("");
  if (const auto timeout = file.integer("timeout-ms", 1, kMaxTimeoutMs)) {
    result->timeout = std::chrono::milliseconds(*timeout);
  }
  result->runTimeout = kRunTimeouts * result->timeout;
  if (const auto timeout = file.integer("run-timeout-ms", 1, kMaxTimeoutMs)) {
    result->runTimeout = std::chrono::milliseconds(*timeout);
  }
  readEtcd(file, hostNames(file, names), result);
  readStateFiles(file, result);
}

// A file that every user may write is not the administrator's.
void checkMode(const std::string &path) {
  struct stat info {};
  if (stat(path.c_str(), &info) != 0 || (info.st_mode & S_IWOTH) == 0) return;
  throw storeError(path, "every user may write it (chmod o-w)");
}

}  // namespace

std::string configurationFile() {
  const char *named = secure_getenv("KESTREL_CONF");
  return named == nullptr || *named == '\0' ? kDefaultFile : named;
}

Configuration readConfiguration(const HostNames *names) {
  Configuration result;
  result.file = configurationFile();
  try {
    const auto file = Platform::KeyValueFile::read(result.file, kKeys);
    result.fileExists = file.has_value();
    if (file) checkMode(result.file);
    if (file) readKeys(*file, names, &result);
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
