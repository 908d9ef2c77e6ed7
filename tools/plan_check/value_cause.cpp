// SPDX-License-Identifier: Apache-2.0
// Recognises spellings of plain values that other configuration languages accept.
#include <algorithm>
#include <array>
#include <cctype>
#include <cstdlib>
#include <regex>
#include <vector>

#include "calc/evaluator.h"
#include "plan_check/cause.h"
#include "plan_check/expression.h"
#include "plan_check/suggestion.h"

namespace Plan {
namespace {

// std::regex needs stack for each byte; a number of that length is not meant as one.
constexpr size_t kMaxLength = 200;

bool matches(const std::string &text, const char *pattern, std::smatch *match = nullptr) {
  std::smatch unused;
  return std::regex_match(text, match == nullptr ? unused : *match,
                          std::regex(pattern, std::regex::icase));
}

std::string quoted(const std::string &text) {
  return "\"" + text + "\"";
}

std::string without(std::string text, char unwanted) {
  text.erase(std::remove(text.begin(), text.end(), unwanted), text.end());
  return text;
}

std::string expectedNumber(Unit unit) {
  switch (unit) {
    case Unit::kMemoryMB:
      return "a number of MB";
    case Unit::kCpuPercent:
      return "a number in percent of one CPU";
    case Unit::kShares:
      return "a number; -2, -3 and -4 are low, normal and high";
    default:
      return "a number";
  }
}

struct Scale {
  const char *pattern;
  double factor;
};

// Of memory in MB, and of CPU in percent.
constexpr std::array<Scale, 5> kMemoryScales = {{{"b|bytes?", 1.0 / 1048576},
                                                 {"k|kb|kib", 1.0 / 1024},
                                                 {"m|mb|mib", 1},
                                                 {"g|gb|gib", 1024},
                                                 {"t|tb|tib", 1048576}}};
constexpr std::array<Scale, 2> kCpuScales = {{{"%|percent|pct", 1}, {"cpus?|cores?|vcpus?", 100}}};

template <typename Scales>
std::string scaled(const std::string &number, const std::string &suffix, const Scales &scales) {
  for (const Scale &scale : scales) {
    if (!matches(suffix, scale.pattern)) continue;
    return numberText(static_cast<float>(std::strtod(number.c_str(), nullptr) * scale.factor));
  }
  return {};
}

Cause withUnit(const std::smatch &match, Unit unit) {
  const std::string number = match[1];
  const std::string suffix = match[2];
  Cause cause{"unit", "a number has no unit: " + quoted(suffix) + " follows it",
              expectedNumber(unit), "", static_cast<size_t>(match.position(2))};
  std::string value;
  if (unit == Unit::kMemoryMB && suffix == "%") {
    value = "!calc physKB / 1024 * " + number + " / 100";
  } else if (unit == Unit::kMemoryMB) {
    value = scaled(number, suffix, kMemoryScales);
  } else if (unit == Unit::kCpuPercent) {
    value = scaled(number, suffix, kCpuScales);
  }
  if (!value.empty()) cause.advice = "write " + value;
  return cause;
}

std::optional<Cause> wordCause(const std::string &text, Unit unit) {
  if (unit == Unit::kShares && matches(text, "low|normal|high")) {
    const std::string number = matches(text, "low") ? "-2" : matches(text, "high") ? "-4" : "-3";
    return Cause{"word", quoted(text) + " is not a number", expectedNumber(unit), "write " + number,
                 0};
  }
  if (matches(text,
              "unlimited|infinit[ey]|infinity|inf|none|max|no ?limit|any|auto|default|-|all")) {
    return Cause{"word", quoted(text) + " is not a number", expectedNumber(unit),
                 "leave the key out where there is no limit", 0};
  }
  if (matches(text, "true|false|yes|no|on|off|y|n|enabled?|disabled?")) {
    return Cause{"word", quoted(text) + " is a truth value", expectedNumber(unit), "", 0};
  }
  return std::nullopt;
}

std::optional<Cause> numberSpelling(const std::string &text, Unit unit) {
  const std::string expected = expectedNumber(unit);
  if (matches(text, "[-+]?\\d{1,3}(,\\d{3})+(\\.\\d*)?")) {
    return Cause{"digit-group", "\",\" is not part of a number", expected,
                 "write " + without(text, ','), text.find(',')};
  }
  if (matches(text, "[-+]?\\d+(\\.\\d+)?[,;]")) {
    return Cause{"separator", quoted(text.substr(text.size() - 1)) + " follows the number",
                 expected, "write " + text.substr(0, text.size() - 1), text.size() - 1};
  }
  if (matches(text, "[-+]?\\d+,\\d+")) {
    std::string point = text;
    point[text.find(',')] = '.';
    return Cause{"decimal-comma", "\",\" is not part of a number", expected, "write " + point,
                 text.find(',')};
  }
  if (matches(text, "[-+]?\\d+([_' ]\\d+)+")) {
    const char mark = text[text.find_first_of("_' ")];
    return Cause{"digit-group", quoted(std::string(1, mark)) + " is not part of a number", expected,
                 "write " + without(text, mark), text.find(mark)};
  }
  if (matches(text, "[-+]?0[xob][0-9a-f]+")) {
    const bool octal = std::tolower(static_cast<unsigned char>(text[text.find('0') + 1])) == 'o';
    const bool hexadecimal = text.find_first_of("xX") != std::string::npos;
    const int base = hexadecimal ? 16 : octal ? 8 : 2;
    const std::string digits = text.substr(text.find('0') + 2);
    return Cause{"base", "a number is decimal: " + quoted(text) + " is not", expected,
                 "write " + std::to_string(std::strtoll(digits.c_str(), nullptr, base)), 0};
  }
  if (matches(text, "\\d+(:\\d+)+")) {
    return Cause{"base", "\":\" is not part of a number", expected, "", text.find(':')};
  }
  if (matches(text, "\\d+ ?(-|\\.\\.|to) ?\\d+")) {
    return Cause{"range", quoted(text) + " is a range", expected,
                 "give the minimum and the maximum with keys of their own", 0};
  }
  std::smatch match;
  if (matches(text, "([-+]?\\d+\\.?\\d*)\\s*([a-z%][a-z/ ]*)", &match)) {
    return withUnit(match, unit);
  }
  return std::nullopt;
}

// A text that would be an expression under the tag for it.
std::optional<Cause> missingTag(const std::string &text, const Calc::VariableTable &variables,
                                const std::string &expected) {
  std::smatch match;
  if (matches(text, "!? ?calc[:(]? *(.*)", &match) && match[1].length() > 0) {
    return Cause{"tag", "the tag for expressions is missing", expected,
                 "write !calc " + std::string(match[1]), 0};
  }
  try {
    (void)Calc::Evaluate(text, variables);
  } catch (const Calc::Exception &fault) {
    const bool unknown = std::string(fault.what()).find("unexpected symbol") != std::string::npos;
    const bool looksLikeOne = text.find_first_of("*/+(") != std::string::npos;
    if (!unknown || !looksLikeOne) return std::nullopt;
  }
  return Cause{"tag", "an expression without its tag", expected, "write !calc " + text, 0};
}

std::optional<Cause> templateCause(const std::string &text, const std::string &expected) {
  const size_t at = text.find_first_of("${}");
  if (at == std::string::npos) return std::nullopt;
  return Cause{"template", quoted(text.substr(at, 1)) + " is not part of a value", expected,
               "variables are used in expressions by their bare names: !calc physKB / 4096", at};
}

}  // namespace

Cause numberCause(const std::string &text, Unit unit, const Calc::VariableTable &variables) {
  const std::string expected = expectedNumber(unit) + ", !calc or !config";
  if (text.size() <= kMaxLength) {
    if (auto cause = wordCause(text, unit)) return *cause;
    if (auto cause = numberSpelling(text, unit)) return *cause;
    if (auto cause = missingTag(text, variables, expected)) return *cause;
    if (auto cause = templateCause(text, expected)) return *cause;
  }
  return {"number", quoted(text) + " is not a number", expected, "", 0};
}

Cause truthCause(const std::string &text, const Calc::VariableTable &variables) {
  const std::string expected = "true, false, yes, no, on, off, !calc or !config";
  if (text.size() <= kMaxLength) {
    if (matches(text, "0|1|0?\\.0|1\\.0")) {
      return {"truth", "a number is not a truth value", expected,
              text[0] == '1' ? "write true" : "write false", 0};
    }
    if (matches(text, "enabled?|active|t|ja|oui|always|(true|yes|on)[.,;]?")) {
      return {"truth", quoted(text) + " is not a truth value", expected, "write true", 0};
    }
    if (matches(text, "disabled?|inactive|f|none|never|nein|non|(false|no|off)[.,;]?")) {
      return {"truth", quoted(text) + " is not a truth value", expected, "write false", 0};
    }
    if (auto cause = missingTag(text, variables, expected)) return *cause;
  }
  return {"truth", quoted(text) + " is not a truth value", expected, "", 0};
}

Cause tagCause(const std::string &tag, const std::string &text) {
  const std::string expected = "a plain value, !calc or !config";
  if (tag.empty()) {
    return {"no-value", "the key has no value", expected, "give one, or remove the key", 0};
  }
  if (tag == "!" && text.compare(0, 4, "calc") == 0) {
    return {"tag", "a blank separates \"!\" from \"calc\"", expected, "write !" + text, 0};
  }
  if (tag == "!") {
    return {"quoted", "a quoted value is a text", expected,
            "remove the quotes: " + (text.empty() ? "there is nothing in them" : text), 0};
  }
  constexpr const char *kStandard = "tag:yaml.org,2002:";
  if (tag.compare(0, std::char_traits<char>::length(kStandard), kStandard) == 0) {
    return {
        "tag",
        "the tag !!" + tag.substr(std::char_traits<char>::length(kStandard)) + " is not accepted",
        expected, "remove the tag", 0};
  }
  const std::string near = closest(tag, {"!calc", "!config", "!calculate", "!cfg"});
  const std::string meant = near == "!calculate" ? "!calc" : near == "!cfg" ? "!config" : near;
  return {"tag", "the tag " + tag + " is not accepted", expected,
          meant.empty() ? "" : "did you mean " + meant + "?", 0};
}

}  // namespace Plan
