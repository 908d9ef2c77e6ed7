// SPDX-License-Identifier: Apache-2.0
// The file is lines of words. Whatever may hold a blank or a line end is base64.
#include "kestrel/etcd/last_known_good.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <filesystem>
#include <optional>
#include <sstream>
#include <system_error>

#include "common/read_file.h"
#include "common/unique_fd.h"
#include "kestrel/etcd/base64.h"
#include "kestrel/replace_file.h"

namespace Kestrel::Etcd {

namespace {

using Clock = std::chrono::system_clock;

constexpr const char *kFirstLine = "kestrel snapshot 1";
constexpr size_t kMaxBytes = size_t{64} << 20;
constexpr std::chrono::hours kRewriteAge{1};
// Clocks of a host are set back by small steps; a larger step says nothing about the file's age.
constexpr std::chrono::minutes kClockStep{5};

std::string systemText(int error) {
  return std::generic_category().message(error);
}

// FNV-1a: it detects damage, not a forger, who could write the file as well.
std::string checksum(std::string_view text) {
  uint64_t hash = 0xcbf29ce484222325U;
  for (const char c : text) hash = (hash ^ static_cast<unsigned char>(c)) * 0x100000001b3U;
  return std::to_string(hash);
}

std::string contentOf(const StoredValues &values) {
  std::string text;
  for (const std::string &part : values.covered) text += "covered " + toBase64(part) + "\n";
  for (const auto &[key, value] : values.values) {
    text += "key " + toBase64(key) + " " + toBase64(value) + "\n";
  }
  return text;
}

std::optional<int64_t> numberIn(const std::string &text) {
  int64_t number = 0;
  const char *end = text.data() + text.size();
  const auto result = std::from_chars(text.data(), end, number);
  if (result.ec != std::errc() || result.ptr != end) return std::nullopt;
  return number;
}

// One line of a file whose checksum is right; false: a line that this version does not know.
bool readLine(const std::string &line, StoredValues *values) {
  std::istringstream words(line);
  std::string name, first, second, rest;
  words >> name >> first >> second >> rest;
  if (!rest.empty()) return false;
  if (name == "cluster") values->cluster = first;
  if (name == "cluster" || name == "content") return true;
  if (name == "revision" || name == "time") {
    const auto number = numberIn(first);
    if (!number) return false;
    if (name == "revision") values->revision = *number;
    if (name == "time") values->time = Clock::time_point(std::chrono::seconds(*number));
    return true;
  }
  const auto key = fromBase64(first), value = fromBase64(second);
  if (!key || !value) return false;
  if (name == "covered") return values->covered.insert(*key).second;
  return name == "key" && values->values.emplace(*key, *value).second;
}

// The text without its last line, which is the checksum of the others; empty: it is not right.
std::optional<std::string_view> checkedBody(std::string_view text) {
  constexpr std::string_view kEnd = "end ";
  const size_t end = text.rfind(kEnd);
  if (end == text.npos || end == 0 || text[end - 1] != '\n') return std::nullopt;
  const std::string_view body = text.substr(0, end);
  if (text.substr(end) != std::string(kEnd) + checksum(body) + "\n") return std::nullopt;
  return body;
}

// "": only the process's own user can have written the file.
std::string distrust(const std::string &path) {
  struct stat info {};
  if (lstat(path.c_str(), &info) != 0) return systemText(errno);
  if (!S_ISREG(info.st_mode)) return "not a regular file";
  if (info.st_uid != geteuid()) return "another user owns it";
  if ((info.st_mode & (S_IRWXG | S_IRWXO)) != 0) return "other users have access (chmod 600)";
  return "";
}

std::string ageProblem(Clock::time_point time, std::chrono::seconds maxAge) {
  const auto age = Clock::now() - time;
  if (age < -kClockStep) return "it is from the future; the clock may be wrong";
  if (age > maxAge) return "it is older than max-age";
  return "";
}

}  // namespace

LastKnownGood::LastKnownGood(const Configuration &configuration) : configuration_(configuration) {}

// What must be the same in the configuration for the values to be those that it asks for.
std::string LastKnownGood::identity() const {
  const std::set<std::string> endpoints(configuration_.endpoints.begin(),
                                        configuration_.endpoints.end());
  std::string text;
  for (const std::string &endpoint : endpoints) text += endpoint + "\n";
  for (const std::string &prefix : configuration_.prefixes) text += prefix + "\n";
  return std::string(kFirstLine) + "\nidentity " + checksum(text + configuration_.user) + "\n";
}

// Whether the file begins as the new one would and is young. Its age is that of the file itself,
// which is never older than the values.
bool LastKnownGood::isFresh(const std::string &head, Clock::time_point now) const {
  struct stat info {};
  if (!distrust(configuration_.snapshot).empty() ||
      stat(configuration_.snapshot.c_str(), &info) != 0) {
    return false;
  }
  const auto age = now - Clock::from_time_t(info.st_mtim.tv_sec);
  if (age < -kClockStep || age > kRewriteAge) return false;
  std::string begin(head.size(), '\0');
  const Platform::UniqueFd fd(open(configuration_.snapshot.c_str(), O_RDONLY | O_CLOEXEC));
  return fd && ::read(fd.get(), begin.data(), begin.size()) == static_cast<ssize_t>(begin.size()) &&
         begin == head;
}

std::string LastKnownGood::write(const StoredValues &values) const {
  if (configuration_.snapshot.empty()) return "";
  const std::string content = contentOf(values);
  const std::string head =
      identity() + "cluster " + values.cluster + "\ncontent " + checksum(content) + "\n";
  if (isFresh(head, values.time)) return "";
  const auto seconds =
      std::chrono::duration_cast<std::chrono::seconds>(values.time.time_since_epoch()).count();
  const std::string body = head + "revision " + std::to_string(values.revision) + "\ntime " +
                           std::to_string(seconds) + "\n" + content;
  const std::string &path = configuration_.snapshot;
  std::error_code ignored;  // replaceFile() reports what is wrong with the folder
  std::filesystem::create_directories(std::filesystem::path(path).parent_path(), ignored);
  try {
    replaceFile(path, body + "end " + checksum(body) + "\n", S_IRUSR | S_IWUSR);
    return "";
  } catch (const std::system_error &error) {
    return error.code().message();
  }
}

bool LastKnownGood::read(StoredValues *values, std::string *why) const {
  if (configuration_.snapshot.empty()) return *why = "no file is configured for it", false;
  *why = distrust(configuration_.snapshot);
  if (!why->empty()) return false;
  std::string text;
  try {
    text = Platform::readFile(configuration_.snapshot, kMaxBytes);
  } catch (const std::system_error &error) {
    return *why = systemText(error.code().value()), false;
  }
  const auto body = checkedBody(text);
  if (!body) return *why = "the file is damaged", false;
  const std::string head = identity();
  if (body->substr(0, head.size()) != head) {
    return *why = "it was read with another configuration", false;
  }
  StoredValues result;
  std::istringstream lines(std::string(body->substr(head.size())));
  for (std::string line; std::getline(lines, line);) {
    if (!readLine(line, &result)) return *why = "the file is damaged", false;
  }
  *why = ageProblem(result.time, configuration_.maxAge);
  if (!why->empty()) return false;
  *values = std::move(result);
  return true;
}

}  // namespace Kestrel::Etcd
