// SPDX-License-Identifier: Apache-2.0
// Reads the script, and computes the results that depend on the groups.
#include "model.h"

#include <algorithm>
#include <map>
#include <sstream>
#include <stdexcept>

namespace Recording {
namespace {

std::map<std::string, std::string> keyValues(std::istringstream &words) {
  std::map<std::string, std::string> result;
  for (std::string word; words >> word;) {
    const size_t sign = word.find('=');
    if (sign == std::string::npos) throw std::runtime_error("no key=value: " + word);
    result[word.substr(0, sign)] = word.substr(sign + 1);
  }
  return result;
}

int64_t number(const std::string &text) {
  return std::stoll(text, nullptr, 0);
}

Group readGroup(std::istringstream &words) {
  Group group;
  words >> group.path;
  for (const auto &[key, value] : keyValues(words)) {
    const std::map<std::string, int64_t *> members{
        {"min", &group.memory.min},           {"max", &group.memory.max},
        {"minLimit", &group.memory.minLimit}, {"shares", &group.memory.shares},
        {"cpuMin", &group.cpu.min},           {"cpuMax", &group.cpu.max},
        {"cpuMinLimit", &group.cpu.minLimit}, {"cpuShares", &group.cpu.shares}};
    if (key == "ownPeakKB") {
      group.ownPeakKB = std::stoull(value);
    } else if (key == "childrenPeakKB") {
      group.childrenPeakKB = std::stoull(value);
    } else if (key == "emptiesAfter") {
      group.emptiesAfter = static_cast<int>(number(value));
    } else {
      *members.at(key) = number(value);
    }
  }
  return group;
}

Rule readRule(std::istringstream &words) {
  Rule rule;
  for (const auto &[key, value] : keyValues(words)) {
    if (key == "function") {
      rule.function = value;
    } else if (key == "node") {
      rule.node = value;
    } else if (key == "group") {
      rule.group = value;
    } else if (key == "signal") {
      rule.signal = static_cast<int>(number(value));
    } else if (key == "status") {
      rule.status = static_cast<uint32_t>(number(value));
    } else if (key == "from") {
      rule.from = static_cast<int>(number(value));
    } else if (key == "count") {
      rule.count = static_cast<int>(number(value));
    } else {
      throw std::runtime_error("unknown key of a rule: " + key);
    }
  }
  return rule;
}

std::string restOfLine(std::istringstream &words) {
  std::string rest;
  std::getline(words >> std::ws, rest);
  return rest;
}

}  // namespace

bool Rule::strikes(const std::string &calledFunction, const std::string &calledNode,
                   const std::string &calledGroup) {
  if (!function.empty() && function != calledFunction) return false;
  if (!node.empty() && node != calledNode) return false;
  if (!group.empty() && group != calledGroup) return false;
  ++seen;
  return seen >= from && (count == 0 || seen < from + count);
}

Model::Model() {
  groups.resize(2);
  groups[0].id = 1;
  groups[0].path = "host";
  groups[1].id = 2;
  groups[1].path = "host/opt";
}

void Model::read(std::istream &script) {
  int64_t scriptedId = 11;
  for (std::string line; std::getline(script, line);) {
    std::istringstream words(line);
    std::string word;
    if (!(words >> word)) continue;
    if (word == "group") {
      Group group = readGroup(words);
      group.id = scriptedId++;
      groups.push_back(group);
    } else if (word == "fail" || word == "send") {
      rules.push_back(readRule(words));
    } else if (word == "cpus") {
      words >> cpus;
    } else if (word == "max-vms") {
      words >> maxVms;
    } else if (word == "vm") {
      isVm = true;
    } else if (word == "memory-kb") {
      words >> memoryKB;
    } else if (word == "cmdline") {
      commandLine = restOfLine(words);
    } else if (word == "mismatch-from") {
      words >> mismatchFrom;
    } else if (word == "own-build") {
      ownBuild = restOfLine(words);
    } else if (word == "running-build") {
      runningBuild = restOfLine(words);
    } else {
      throw std::runtime_error("unknown line of the script: " + line);
    }
  }
}

void Model::writeGroups(std::ostream &out) const {
  std::vector<const Group *> sorted;
  for (const Group &group : groups) sorted.push_back(&group);
  std::sort(sorted.begin(), sorted.end(),
            [](const Group *a, const Group *b) { return a->path < b->path; });
  for (const Group *group : sorted) {
    out << group->path;
    for (const auto &[title, values] :
         {std::pair{" mem ", group->memory}, std::pair{" cpu ", group->cpu}})
      out << title << values.min << ' ' << values.max << ' ' << values.minLimit << ' '
          << values.shares;
    out << '\n';
  }
}

Group *Model::find(int64_t id) {
  for (Group &group : groups)
    if (group.id == id) return &group;
  return nullptr;
}

Group *Model::find(const std::string &path) {
  for (Group &group : groups)
    if (group.path == path) return &group;
  return nullptr;
}

std::vector<int64_t> Model::children(const Group &group) const {
  std::vector<int64_t> result;
  for (const Group &other : groups) {
    const size_t slash = other.path.rfind('/');
    if (slash != std::string::npos && other.path.substr(0, slash) == group.path)
      result.push_back(other.id);
  }
  return result;
}

uint32_t Model::create(const std::string &path, int64_t *id) {
  if (find(path) != nullptr) return kExists;
  Group group;
  group.id = nextId++;
  group.path = path;
  groups.push_back(group);
  *id = group.id;
  return 0;
}

uint32_t Model::remove(int64_t id) {
  const Group *group = find(id);
  if (group == nullptr) return kNotFound;
  if (!children(*group).empty()) return kBusy;
  groups.erase(groups.begin() + (group - groups.data()));
  return 0;
}

uint32_t apply(const std::vector<std::string> &settings, Allocation *allocation) {
  Allocation changed = *allocation;
  const std::map<std::string, int64_t *> members{{"min", &changed.min},
                                                 {"max", &changed.max},
                                                 {"minLimit", &changed.minLimit},
                                                 {"shares", &changed.shares}};
  for (const std::string &setting : settings) {
    const size_t sign = setting.find('=');
    const auto member = members.find(setting.substr(0, sign));
    if (sign == std::string::npos || member == members.end()) return kBadParameter;
    *member->second = number(setting.substr(sign + 1));
  }
  *allocation = changed;
  return 0;
}

}  // namespace Recording
