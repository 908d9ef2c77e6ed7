// SPDX-License-Identifier: Apache-2.0
// The loader's own constructor decides about each item of the file. A text that the yaml library
// refuses as a whole is read pool by pool, so that one mistake does not hide the others.
#include "plan_check/definition_check.h"

#include <yaml-cpp/yaml.h>

#include <algorithm>
#include <cctype>
#include <exception>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <set>
#include <utility>

#include "plan_check/name_check.h"
#include "plan_check/second_document.h"
#include "plan_check/suggestion.h"
#include "plan_check/syntax_cause.h"
#include "plan_check/value_check.h"
#include "yaml/node.h"

namespace Plan {
namespace {

constexpr const char *kPoolShape = "a mapping: \"- name: NAME\" and further keys below it";

bool isText(const YAML::Node &node) {
  return node.IsScalar() && !Yaml::isNull(node);
}

Unit unitOf(const std::string &key) {
  if (key == "memShares" || key == "cpuShares") return Unit::kShares;
  return key.compare(0, 3, "cpu") == 0 ? Unit::kCpuPercent : Unit::kMemoryMB;
}

// "mem_max", "mem-max" and "MemMax" are "memmax".
std::string simplified(const std::string &key) {
  std::string text;
  for (const char c : key) {
    if (std::isalnum(static_cast<unsigned char>(c)) != 0) {
      text += static_cast<char>(std::tolower(static_cast<unsigned char>(c)));
    }
  }
  return text;
}

struct Synonym {
  const char *word;
  const char *advice;
};

constexpr Synonym kSynonyms[] = {
    {"memory", "did you mean mem?"},
    {"ram", "did you mean mem?"},
    {"memorymin", "did you mean memMin?"},
    {"memminimum", "did you mean memMin?"},
    {"memmaximum", "did you mean memMax?"},
    {"cpuminimum", "did you mean cpuMin?"},
    {"cpumaximum", "did you mean cpuMax?"},
    {"memorymax", "did you mean memMax?"},
    {"memlimit", "did you mean memMax?"},
    {"memorylimit", "did you mean memMax?"},
    {"memreservation", "did you mean memMin?"},
    {"cpu", "write cpuMin and cpuMax"},
    {"cpulimit", "did you mean cpuMax?"},
    {"cpureservation", "did you mean cpuMin?"},
    {"cpuminlimit", "there is no such key for the CPU"},
    {"shares", "write memShares or cpuShares"},
    {"enabled", "did you mean isEnabled?"},
    {"enable", "did you mean isEnabled?"},
    {"disabled", "write isEnabled: false"},
    {"id", "did you mean name?"},
    {"path", "did you mean name?"},
    {"pool", "did you mean name?"},
    {"parent", "the parent is part of the name: PARENT/NAME"},
    {"children", "a child is a pool of its own, named PARENT/NAME"},
    {"pools", "a child is a pool of its own, named PARENT/NAME"},
};

std::string adviceForKey(const std::string &key, const std::vector<std::string> &known) {
  if (key == "<<") return "merge keys are not supported: write the keys out";
  const size_t colon = key.find(':');
  if (colon != std::string::npos) return "write a blank behind the colon";
  const std::string plain = simplified(key);
  for (const std::string &candidate : known) {
    if (simplified(candidate) == plain) return "did you mean " + candidate + "?";
  }
  for (const Synonym &synonym : kSynonyms) {
    if (plain == synonym.word) return synonym.advice;
  }
  const std::string near = closest(key, known);
  return near.empty() ? "" : "did you mean " + near + "?";
}

class FileCheck {
 public:
  FileCheck(CheckedFile *result, const Calc::VariableTable &facts)
      : result_(result),
        source_(*result->source),
        facts_(facts),
        values_(source_, facts, &result->findings) {}

  void run() {
    try {
      checkDocument(YAML::Load(source_.text()));
    } catch (const YAML::Exception &error) {
      checkPoolByPool(error);
    }
  }

 private:
  void add(Severity severity, Place place, Cause cause, const std::string &pool = "") {
    result_->findings.push_back({severity, std::move(cause.code), source_.path(), place, pool,
                                 std::move(cause.message), std::move(cause.expected),
                                 std::move(cause.advice), false});
  }

  void checkDocument(const YAML::Node &document) {
    if (document.IsMap()) {
      wrongTopLevel(document);
    } else if (document.IsSequence()) {
      for (const auto &item : document) checkItem(item);
    } else if (isText(document)) {
      add(Severity::kWarning, source_.placeOf(document.Mark()),
          {"no-pools", "the file holds a text and declares no pools", "a list of pools", "", 0});
    } else {
      add(Severity::kWarning, Place(), {"no-pools", "the file declares no pools", "", "", 0});
    }
    checkOtherDocuments();
  }

  void wrongTopLevel(const YAML::Node &document) {
    const auto first = document.begin();
    if (first == document.end()) {  // iterated without a single step: no pools
      add(Severity::kWarning, source_.placeOf(document.Mark()),
          {"no-pools", "the file declares no pools", "a list of pools", "", 0});
      return;
    }
    const std::string key = isText(first->first) ? first->first.Scalar() : "";
    Cause cause{"top-level", "the file is a mapping and not a list of pools",
                "\"- \" before each pool", "write - " + key + ": ...", 0};
    if (!key.empty() && key[0] == '-') cause.advice = "write a blank behind \"-\"";
    if (key == "pools" || key == "resourcePools") cause.advice = "remove the line " + key + ":";
    add(Severity::kError, source_.placeOf(first->first.Mark()), cause);
  }

  // Only the first document of a file is read.
  void checkOtherDocuments() {
    const Place place = source_.placeOf(secondDocument(source_.text()));
    if (place.line < 0) return;
    const bool separated = place.line > 0 && hasSeparatorBefore(place.line);
    add(Severity::kWarning, place,
        {"second-document", "this and all that follows is a second document, which is not read",
         separated ? "one document in each file" : "the indentation of the pool that it belongs to",
         separated ? "remove the line ---" : "", 0});
  }

  bool hasSeparatorBefore(int line) const {
    for (int number = line; number >= 0; --number) {
      if (number > 0 && source_.line(number).substr(0, 3) == "---") return true;
    }
    return false;
  }

  void checkItem(const YAML::Node &item) {
    const size_t before = result_->findings.size();
    DeclaredPool declared;
    declared.file = source_.path();
    declared.place = source_.placeOf(item.Mark());
    checkContent(item, &declared);
    YAML::Mark mark = YAML::Mark::null_mark();
    std::string message;
    try {
      declared.pool = std::make_shared<Loader::ResourcePoolImpl>(item, facts_);
    } catch (const YAML::Exception &error) {
      mark = error.mark;
      message = error.msg;
    } catch (const std::exception &error) {
      message = error.what();
    }
    std::string path = declared.pool ? declared.pool->name : "";
    for (size_t i = before; i < result_->findings.size(); ++i) result_->findings[i].pool = path;
    if (declared.pool) {
      result_->pools.push_back(std::move(declared));
    } else if (!hasErrorSince(before)) {
      add(Severity::kError, source_.placeOf(mark), {"refused", message, "", "", 0});
    }
  }

  bool hasErrorSince(size_t first) const {
    return std::any_of(result_->findings.begin() + static_cast<std::ptrdiff_t>(first),
                       result_->findings.end(), [](const Finding &finding) {
                         return finding.severity == Severity::kError && !finding.isAtLoad;
                       });
  }

  void checkContent(const YAML::Node &item, DeclaredPool *declared) {
    if (!item.IsMap()) {
      wrongItem(item);
      return;
    }
    for (const auto &entry : item) {
      if (isText(entry.first)) {
        checkEntry(entry.first, entry.second, declared);
      } else {
        add(Severity::kError, source_.placeOf(entry.first.Mark()),
            {"key", "a key must be a text", "one of " + joined(Loader::poolKeys()), "", 0});
      }
    }
    if (declared->values.count("name") == 0) {
      add(Severity::kError, declared->place,
          {"no-name", "the pool has no name", "the key name", "", 0});
    }
  }

  void wrongItem(const YAML::Node &item) {
    Cause cause{"item", "a pool must be a mapping", kPoolShape, "", 0};
    if (isText(item)) {
      const std::string &text = item.Scalar();
      cause.message = "a pool must be a mapping, and this is the text \"" + text + "\"";
      const bool glued = text.find(':') != std::string::npos;
      cause.advice = glued ? "write a blank behind the colon" : "write - name: " + text;
    } else if (item.IsSequence()) {
      cause.message = "a pool must be a mapping, and this is a list";
      cause.advice = "one \"- \" for each pool";
    } else {
      cause.message = "\"- \" is followed by nothing";
      cause.advice = "remove it, or indent what belongs to it";
    }
    const Place place = source_.placeOf(item.Mark());
    add(Severity::kError, place, std::move(cause));
  }

  void checkEntry(const YAML::Node &key, const YAML::Node &value, DeclaredPool *declared) {
    const std::string &name = key.Scalar();
    const std::vector<std::string> known = Loader::poolKeys();
    const Place place = source_.placeOf(key.Mark());
    if (std::find(known.begin(), known.end(), name) == known.end()) {
      if (isRestOfAValue(value)) return;
      add(Severity::kError, place,
          {"unknown-key", "unknown key \"" + name + "\"", "one of " + joined(known),
           adviceForKey(name, known), 0});
      return;
    }
    warnOfOverwriting(name, place, *declared);
    declared->keyPlaces[name] = place;
    declared->values[name].reset(value);
    if (name == "name") {
      checkName(key, value);
    } else if (name == "isEnabled") {
      (void)values_.check(key, value, ValueKind::kTruth, Unit::kNone);
    } else {
      (void)values_.check(key, value, ValueKind::kNumber, unitOf(name));
    }
  }

  // Behind a comma that ended a value by mistake, the rest of the value is read as a key.
  bool isRestOfAValue(const YAML::Node &value) const {
    return Yaml::isNull(value) && !result_->findings.empty() &&
           result_->findings.back().code == "comma";
  }

  void warnOfOverwriting(const std::string &key, Place place, const DeclaredPool &declared) {
    const auto earlier = declared.keyPlaces.find(key);
    if (earlier != declared.keyPlaces.end()) {
      add(Severity::kWarning, place,
          {"key-twice",
           "\"" + key + "\" is given twice; the value in line " +
               std::to_string(earlier->second.line + 1) + " does not count",
           "", "", 0});
    }
    if (key != "mem") return;
    for (const char *const part : {"memMin", "memMax"}) {
      const auto overwritten = declared.keyPlaces.find(part);
      if (overwritten == declared.keyPlaces.end()) continue;
      add(Severity::kWarning, place,
          {"key-twice",
           "\"mem\" sets both limits; " + std::string(part) + " in line " +
               std::to_string(overwritten->second.line + 1) + " does not count",
           "", "write mem first, or leave it out", 0});
    }
  }

  void checkName(const YAML::Node &key, const YAML::Node &value) {
    if (!isText(value)) {
      const bool null = Yaml::isNull(value);
      add(Severity::kError, source_.placeOf(null ? key.Mark() : value.Mark()),
          {null ? "no-name" : "name", null ? "the name has no value" : "the name must be a text",
           "a path such as web or web/cache", "", 0});
      return;
    }
    const std::string &name = value.Scalar();
    const Place place = source_.placeInScalar(value.Mark(), name, 0);
    if (name.empty()) {
      add(Severity::kError, place, {"no-name", "the name is empty", "a path such as web", "", 0});
      return;
    }
    const std::string tag = Yaml::tagOf(value);
    if (tag != "?" && tag != "!") {
      add(Severity::kWarning, place,
          {"name", "a name is plain text: the tag " + tag + " has no effect", "", "remove it", 0});
    }
    if (source_.isOpenQuote(source_.placeOf(value.Mark()))) {
      add(Severity::kWarning, source_.placeOf(value.Mark()),
          {"quote", "a quote is not closed", "a quote at the end of the text", "", 0});
      return;
    }
    const bool full = name.compare(0, 5, "host/") == 0;
    const auto problem = nameProblem(name, full ? name : "host/opt/" + name);
    if (problem) {
      add(problem->isRefused ? Severity::kError : Severity::kWarning, place, problem->cause);
      result_->findings.back().isAtLoad = problem->isRefused;
    }
  }

  // Each part of the text that begins like a pool is read alone, at its place in the file.
  void checkPoolByPool(const YAML::Exception &whole) {
    const size_t before = result_->findings.size();
    const std::vector<int> starts = poolStarts();
    bool foundSyntax = false;
    for (size_t i = 0; i < starts.size(); ++i) {
      const int end = i + 1 < starts.size() ? starts[i + 1] : -1;
      try {
        const YAML::Node part = YAML::Load(textOf(starts[i], end));
        if (!part.IsSequence()) continue;
        for (const auto &item : part) checkItem(item);
      } catch (const YAML::Exception &error) {
        // An anchor may be in another part.
        const bool alias = error.msg.find("anchor") != std::string::npos;
        if (alias && whole.msg.find("anchor") == std::string::npos) continue;
        foundSyntax = true;
        result_->findings.push_back(syntaxFinding(source_, source_.placeOf(error.mark), error.msg));
      }
    }
    if (foundSyntax) return;
    result_->findings.insert(result_->findings.begin() + static_cast<std::ptrdiff_t>(before),
                             syntaxFinding(source_, source_.placeOf(whole.mark), whole.msg));
  }

  std::vector<int> poolStarts() const {
    std::vector<int> starts;
    size_t column = std::string::npos;
    const auto lines =
        static_cast<int>(1 + std::count(source_.text().begin(), source_.text().end(), '\n'));
    for (int number = 0; number < lines; ++number) {
      const std::string_view line = source_.line(number);
      const size_t dash = line.find_first_not_of(' ');
      const bool isStart = dash != std::string_view::npos && line.substr(dash, 2) == "- ";
      if (!isStart || (column != std::string::npos && dash != column)) continue;
      column = dash;
      starts.push_back(number);
    }
    return starts;
  }

  std::string textOf(int first, int end) const {
    std::string text(static_cast<size_t>(first), '\n');
    const auto lines =
        static_cast<int>(1 + std::count(source_.text().begin(), source_.text().end(), '\n'));
    for (int number = first; number < (end < 0 ? lines : end); ++number) {
      text += std::string(source_.line(number)) + "\n";
    }
    return text;
  }

  CheckedFile *const result_;
  const SourceFile &source_;
  const Calc::VariableTable &facts_;
  ValueCheck values_;
};

}  // namespace

CheckedFile checkText(const std::string &name, std::string text, const Calc::VariableTable &facts) {
  CheckedFile result;
  result.source = std::make_shared<const SourceFile>(name, std::move(text));
  FileCheck(&result, facts).run();
  std::stable_sort(
      result.findings.begin(), result.findings.end(), [](const Finding &a, const Finding &b) {
        return std::pair(a.place.line, a.place.column) < std::pair(b.place.line, b.place.column);
      });
  return result;
}

CheckedFile checkFile(const std::string &path, const std::string &name,
                      const Calc::VariableTable &facts) {
  std::ifstream stream(path, std::ios::binary);
  std::error_code unknown;
  if (stream && !std::filesystem::is_directory(path, unknown)) {
    std::string text((std::istreambuf_iterator<char>(stream)), {});
    return checkText(name, std::move(text), facts);
  }
  CheckedFile result;
  result.source = std::make_shared<const SourceFile>(name, "");
  result.findings.push_back({Severity::kError, "unreadable", name, Place(), "",
                             "the file cannot be read", "", "", false});
  return result;
}

Place placeOfKey(const DeclaredPool &pool, const std::string &key) {
  const auto found = pool.keyPlaces.find(key);
  return found == pool.keyPlaces.end() ? pool.place : found->second;
}

}  // namespace Plan
