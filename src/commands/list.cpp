// SPDX-License-Identifier: Apache-2.0
// Prints the declared pools as a table or as comma-separated values. Makes no call on groups.
#include <unistd.h>

#include <iomanip>
#include <iostream>
#include <string>
#include <vector>

#include "commands/commands.h"
#include "commands/operands.h"
#include "console/message.h"
#include "console/result.h"
#include "loader/definition_files.h"

namespace {

using Loader::ResourcePoolImpl;

constexpr const char *kUsage =
    "poolctl list [flags] [files...]\n"
    "    List resource pools defined in yaml files. If no files are specified,\n"
    "    all yaml files in /etc/rp.d will be used.\n"
    "Flags:\n"
    "    -v              Use CSV format instead of table.\n";

struct Form {
  int nameWidth;
  int valueWidth;
  char separator;
};

// Scripts split the table at the NUL. A terminal does not show it.
constexpr Form kTable = {48, 12, '\0'};
constexpr Form kCsv = {0, 0, ','};

std::string int64ToString(int64_t value) {
  return value == -1 ? "-" : std::to_string(value);
}

std::string int32ToString(int32_t value) {
  return value == -1 ? "-" : std::to_string(value);
}

std::string sharesToString(int64_t value) {
  switch (value) {
    case -1:
      return "-";
    case -2:
      return "low";
    case -3:
      return "normal";
    case -4:
      return "high";
    default:
      return std::to_string(value);
  }
}

struct Column {
  const char *title;
  std::string (*text)(const ResourcePoolImpl &pool);
};

constexpr Column kColumns[] = {
    {"auto", [](auto &pool) { return std::string(pool.isEnabled ? "yes" : "no"); }},
    {"memMin", [](auto &pool) { return int64ToString(pool.mem.min); }},
    {"memMax", [](auto &pool) { return int64ToString(pool.mem.max); }},
    {"memMinLimit", [](auto &pool) { return int64ToString(pool.mem.minLimit); }},
    {"memShares", [](auto &pool) { return sharesToString(pool.mem.shares); }},
    {"cpuMin", [](auto &pool) { return int32ToString(pool.cpu.min); }},
    {"cpuMax", [](auto &pool) { return int32ToString(pool.cpu.max); }},
    {"cpuShares", [](auto &pool) { return sharesToString(pool.cpu.shares); }},
};

template <typename TextOf>
void printLine(const Form &form, const std::string &name, TextOf textOf) {
  std::cout << std::left << std::setw(form.nameWidth) << Console::resultText(name) << std::right;
  for (const Column &column : kColumns) {
    std::cout << form.separator << std::setw(form.valueWidth) << textOf(column);
  }
  std::cout << '\n';
  Console::flushResults();
}

}  // namespace

int cmdList(int argc, char **argv) {
  Form form = kTable;
  for (int option; (option = getopt(argc, argv, "hv")) != -1;) {
    if (option == 'v') {
      form = kCsv;
      continue;
    }
    Console::printUsage(kUsage);
    return option == 'h' ? 0 : 1;
  }
  printLine(form, "name", [](const Column &column) { return column.title; });
  for (const auto &pool : Loader::loadPools(operands(argc, argv), false)) {
    printLine(form, pool->name, [&pool](const Column &column) { return column.text(*pool); });
  }
  return 0;
}
