// SPDX-License-Identifier: Apache-2.0
// The option mode: sizes and watches one memory group at a time. Kept for older scripts.
#include <syslog.h>
#include <unistd.h>

#include <cinttypes>
#include <cstdarg>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <iostream>
#include <optional>

#include "commands/commands.h"
#include "commands/legacy_group.h"
#include "console/message.h"
#include "console/result.h"
#include "platform/knob.h"

namespace {

constexpr const char *kUsage =
    "poolctl <options>\n"
    "   Legacy memory resource pool operations\n"
    "Options:\n"
    "    -e              Check if group is empty\n"
    "    -g path         Specify group path\n"
    "    -i              Print group configuration and stats\n"
    "    -m memMB        Size memory for the group\n"
    "    -w time         Time in seconds to poll and wait for group to become empty\n";

// Scripts test these.
constexpr int kSuccess = 0;
constexpr int kBadOption = 1;
constexpr int kNotEmpty = 2;
constexpr int kTimedOut = 3;
constexpr int kKernelFailure = 4;

constexpr uint32_t kPollMicroseconds = 100000;

// Nothing here takes memory: the mode works when memory is short.
struct Request {
  int64_t groupId = -1;
  const char *groupName = "<not initialized>";  // the path that was given
  int memoryMB = 0;
  int64_t waitMicroseconds = 0;
  bool checkEmpty = false;
  bool wait = false;
  bool info = false;
  bool setMemory = false;
};

__attribute__((format(printf, 1, 2))) void logMessage(const char *format, ...) {
  openlog("poolctl", LOG_PERROR | LOG_NDELAY, LOG_DAEMON);
  va_list arguments;
  va_start(arguments, format);
  vsyslog(LOG_INFO, format, arguments);
  va_end(arguments);
  closelog();
}

void requireMatchingKernel() {
  char runningBuild[21] = {};
  const char *myBuild = "";
  if (KNOB_CheckSig(runningBuild, sizeof runningBuild, &myBuild) == 0) return;
  Console::printError("error: md5 signature mismatch with running nucleus built on ", runningBuild,
                      " (my build date: ", myBuild, ")");
  exit(kBadOption);
}

bool readGroup(const char *path, Request &request) {
  if (const auto status = Legacy::lookUpGroup(path, &request.groupId)) {
    logMessage("Group %s was not found: %s\n", path, NUC_ReturnStatusToString(status));
    return false;
  }
  request.groupName = path;
  return true;
}

bool readMemorySize(const char *text, Request &request) {
  if (*text == '\0') {
    logMessage("memory size (MB) is not specified\n");
    return false;
  }
  char *end = nullptr;
  request.memoryMB = static_cast<int>(strtol(text, &end, 10));
  if (*end != '\0') {
    logMessage("incorrect value for memory size (MB) specified: %s\n", text);
    return false;
  }
  request.setMemory = true;
  return true;
}

bool readWaitTime(const char *text, Request &request) {
  if (*text == '\0') {
    logMessage("wait time is not specified\n");
    return false;
  }
  char *end = nullptr;
  const long seconds = strtol(text, &end, 10);
  if (*end != '\0') {
    logMessage("incorrect value for wait time specified: %s\n", text);
    return false;
  }
  // Too many seconds wrap; a product of signed numbers that overflows would be undefined.
  request.waitMicroseconds = static_cast<int64_t>(static_cast<uint64_t>(seconds) * 1000000U);
  request.wait = true;
  return true;
}

// The exit status, if an option ends the process.
std::optional<int> parseOptions(int argc, char **argv, Request &request) {
  for (int option; (option = getopt(argc, argv, "eg:im:w:h")) != -1;) {
    switch (option) {
      case 'e':
        request.checkEmpty = true;
        break;
      case 'g':
        if (!readGroup(optarg, request)) return kBadOption;
        break;
      case 'i':
        request.info = true;
        break;
      case 'm':
        if (!readMemorySize(optarg, request)) return kBadOption;
        break;
      case 'w':
        if (!readWaitTime(optarg, request)) return kBadOption;
        break;
      default:
        Console::printUsage(kUsage);
        return option == 'h' ? kSuccess : kBadOption;
    }
  }
  return std::nullopt;
}

int reportEmptiness(const Request &request) {
  int count = 0;
  if (const auto status = Legacy::countMemberGroups(request.groupId, &count)) {
    logMessage("Failed to check group %s: %s\n", request.groupName,
               NUC_ReturnStatusToString(status));
    return kKernelFailure;
  }
  std::cout << (count == 0 ? "empty\n" : "not empty\n");
  Console::flushResults();
  return count == 0 ? kSuccess : kNotEmpty;
}

// A kernel call that fails counts as a group that is not empty. The counter adds up the sleeps
// alone and wraps, so a budget beyond its range is never used up.
bool pollUntilEmpty(const Request &request) {
  if (request.waitMicroseconds < 1) return false;
  uint32_t elapsedMicroseconds = 0;
  int count = 0;
  while (Legacy::countMemberGroups(request.groupId, &count) != 0 || count != 0) {
    usleep(kPollMicroseconds);
    elapsedMicroseconds += kPollMicroseconds;
    if (elapsedMicroseconds >= request.waitMicroseconds) return false;
  }
  return true;
}

int waitUntilEmpty(const Request &request) {
  if (!pollUntilEmpty(request)) {
    logMessage("Timeout waiting for %s to be empty", request.groupName);
    return kTimedOut;
  }
  std::cout << "empty\n";
  Console::flushResults();
  return kSuccess;
}

// Rounded up.
uint64_t kbToMB(uint64_t kb) {
  return (kb + 1023) >> 10;
}

int printInfo(const Request &request) {
  Legacy::MemoryReport report;
  if (const auto status = Legacy::readMemoryReport(request.groupId, &report)) {
    logMessage("Failed to get groups %s stats: %s\n", request.groupName,
               NUC_ReturnStatusToString(status));
    return kKernelFailure;
  }
  printf("{\n\"minMB\": %" PRId64 ",\n\"maxMB\": %" PRId64 ",\n\"rminpeakMB\": %" PRId64
         ",\n\"rminchildpeakMB\": %" PRId64 "\n}\n",
         report.minMB, report.maxMB, static_cast<int64_t>(kbToMB(report.ownPeakKB)),
         static_cast<int64_t>(kbToMB(report.childrenPeakKB)));
  Console::flushResults();
  return kSuccess;
}

int setMemorySize(const Request &request) {
  if (const auto status = Legacy::setGroupMemSize(request.groupId, request.memoryMB)) {
    logMessage("Failed to set group %s mem: %s\n", request.groupName,
               NUC_ReturnStatusToString(status));
    return kKernelFailure;
  }
  return kSuccess;
}

// -e ignores all other options, and -w ignores -i.
int runRequest(const Request &request) {
  if (request.checkEmpty) return reportEmptiness(request);
  if (request.wait) {
    if (const int result = waitUntilEmpty(request)) return result;
  } else if (request.info) {
    if (const int result = printInfo(request)) return result;
  }
  return request.setMemory ? setMemorySize(request) : kSuccess;
}

}  // namespace

int legacyMain(int argc, char **argv) {
  requireMatchingKernel();
  Request request;
  if (const auto exitStatus = parseOptions(argc, argv, request)) return *exitStatus;
  if (request.groupId == -1) {
    logMessage("Group -g parameter was not specified\n");
    return kBadOption;
  }
  return runRequest(request);
}
