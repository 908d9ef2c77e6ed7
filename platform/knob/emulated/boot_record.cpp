// SPDX-License-Identifier: Apache-2.0
// The file: one value a line in a fixed order, the command line last, as it may hold anything. It
// names the state that it belongs to by device and inode, so that it outlives no state.
#include "knob/emulated/boot_record.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <string_view>
#include <system_error>

#include "common/number.h"
#include "common/read_file.h"
#include "common/unique_fd.h"
#include "common/write_all.h"

namespace Knob {
namespace {

constexpr std::string_view kForm = "knob boot record 1";
constexpr size_t kMaxBytes = 8192;

std::string recordPath(const std::string &statePath) {
  return statePath + "-facts";
}

// Which file the state is; empty when there is none.
std::string identityOf(const std::string &statePath) {
  struct stat status {};
  if (::stat(statePath.c_str(), &status) != 0) return {};
  return std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
}

std::string_view takeLine(std::string_view &text) {
  const size_t end = text.find('\n');
  const std::string_view line = text.substr(0, end);
  text.remove_prefix(end == std::string_view::npos ? text.size() : end + 1);
  return line;
}

template <typename Number>
bool takeNumber(std::string_view &text, Number &number) {
  const auto value = Platform::parseNumber<Number>(takeLine(text));
  if (value) number = *value;
  return value.has_value();
}

std::optional<BootRecord> parse(std::string_view text, std::string_view identity) {
  if (takeLine(text) != kForm || takeLine(text) != identity) return std::nullopt;
  BootRecord record;
  record.signature.md5 = takeLine(text);
  record.signature.buildDate = takeLine(text);
  int64_t maxVms = 0;
  int isVm = 0;
  if (!takeNumber(text, record.facts.cpus) || !takeNumber(text, record.facts.memoryKB) ||
      !takeNumber(text, isVm) || !takeNumber(text, maxVms)) {
    return std::nullopt;
  }
  if (maxVms >= 0) record.maxVms = static_cast<uint32_t>(maxVms);
  record.facts.isVm = isVm != 0;
  record.facts.bootCommandLine = text;
  return record;
}

std::string written(const BootRecord &record, const std::string &identity) {
  const int64_t maxVms = record.maxVms ? int64_t{*record.maxVms} : -1;
  std::string text;
  for (const std::string &line :
       {std::string(kForm), identity, record.signature.md5, record.signature.buildDate,
        std::to_string(record.facts.cpus), std::to_string(record.facts.memoryKB),
        std::string(record.facts.isVm ? "1" : "0"), std::to_string(maxVms)}) {
    text += line + "\n";
  }
  return text + record.facts.bootCommandLine;
}

bool writeNewFile(const std::string &path, std::string_view content) {
  constexpr mode_t kForAllToRead = 0644;
  (void)::unlink(path.c_str());  // left by a boot that was killed, or a link to another file
  const Platform::UniqueFd fd(
      ::open(path.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, kForAllToRead));
  return fd && Platform::writeAll(fd.get(), content) == 0;
}

}  // namespace

std::optional<BootRecord> readBootRecord(const std::string &statePath) {
  const std::string identity = identityOf(statePath);
  if (identity.empty()) return std::nullopt;
  try {
    return parse(Platform::readFile(recordPath(statePath), kMaxBytes), identity);
  } catch (const std::system_error &) {
    return std::nullopt;
  }
}

void removeBootRecord(const std::string &statePath) {
  (void)::unlink(recordPath(statePath).c_str());
}

void writeBootRecord(const std::string &statePath, const BootRecord &record) {
  const std::string path = recordPath(statePath);
  const std::string beside = path + ".new";
  const std::string identity = identityOf(statePath);
  if (!writeNewFile(beside, written(record, identity)) ||
      ::rename(beside.c_str(), path.c_str()) != 0) {
    (void)::unlink(beside.c_str());
  }
}

}  // namespace Knob
