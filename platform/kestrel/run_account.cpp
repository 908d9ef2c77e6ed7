// SPDX-License-Identifier: Apache-2.0
// The texts of the report, and where they go.
#include "kestrel/run_account.h"

#include <sys/stat.h>
#include <syslog.h>

#include <cerrno>
#include <chrono>
#include <exception>
#include <filesystem>

#include "kestrel/replace_file.h"
#include "kestrel/text.h"

namespace Kestrel {

namespace {

constexpr mode_t kMode = 0644;

std::string age(const RunSource &source) {
  const auto seconds = std::chrono::duration_cast<std::chrono::seconds>(
      std::chrono::system_clock::now() - source.time);
  return std::to_string(seconds.count());
}

void writeLastRun(const std::string &path, const std::string &text) {
  std::error_code ignored;  // replaceFile() reports what is wrong with the folder
  std::filesystem::create_directory(std::filesystem::path(path).parent_path(), ignored);
  // The file describes a run of this boot: it need not outlive it, and runs do not wait for a disk.
  replaceFile(path, text, kMode, Durability::kNone);
}

}  // namespace

std::string lastRunText(const std::string &program, const RunCounts &counts,
                        const RunSource &source) {
  std::string text = "time = " + inUtc(std::chrono::system_clock::now()) + "\n";
  text += "program = " + escaped(program) + "\nsource = " + source.name + "\n";
  if (source.revision != 0) {
    text += "revision = " + std::to_string(source.revision) + "\nage = " + age(source) + "\n";
  }
  text += "values = " + std::to_string(counts.values) +
          "\ndefaults = " + std::to_string(counts.defaults) +
          "\nfailures = " + std::to_string(counts.failures) + "\n";
  if (!source.problem.empty()) text += "problem = " + escaped(source.problem) + "\n";
  if (!counts.error.empty()) text += "error = " + escaped(counts.error) + "\n";
  return text;
}

std::string logLine(const RunCounts &counts, const RunSource &source) {
  if (source.problem.empty() && counts.failures == 0) return "";
  std::string line = "kestrel: " + std::to_string(counts.values) + " values from " + source.name;
  if (source.revision != 0) {
    line += " (revision " + std::to_string(source.revision) + ", " + age(source) + " s old)";
  }
  line += ", " + std::to_string(counts.defaults) + " defaults, " + std::to_string(counts.failures) +
          " failed lookups";
  const std::string &why = source.problem.empty() ? counts.error : source.problem;
  return line + ": " + escaped(why);
}

void reportRun(const Configuration &configuration, const RunCounts &counts,
               const RunSource &source) noexcept {
  try {
    const std::string line = logLine(counts, source);
    if (!line.empty()) syslog(LOG_DAEMON | LOG_WARNING, "%s", line.c_str());
    if (configuration.lastRun.empty()) return;
    writeLastRun(configuration.lastRun, lastRunText(program_invocation_short_name, counts, source));
  } catch (const std::exception &) {
    // Nothing is left to report to.
  }
}

}  // namespace Kestrel
