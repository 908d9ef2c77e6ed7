// SPDX-License-Identifier: Apache-2.0
// Lines and columns count from 1 here; columns count bytes, as in poolctl's own messages.
#include "plan_check/report.h"

#include <algorithm>
#include <nlohmann/json.hpp>

#include "shared/text.h"

namespace Plan {
namespace {

constexpr size_t kMaxExcerpt = 160;

const char *nameOf(Severity severity) {
  return severity == Severity::kError ? "error" : "warning";
}

std::string_view sourceLine(const Finding &finding, const Sources &sources) {
  const auto source = sources.find(finding.file);
  return source == sources.end() ? std::string_view() : source->second->line(finding.place.line);
}

// The line, and below it a caret; a long line is left out.
std::string excerpt(const Finding &finding, const Sources &sources) {
  const std::string_view line = sourceLine(finding, sources);
  if (finding.place.line < 0 || line.empty() || line.size() > kMaxExcerpt) return {};
  const auto column = std::min(static_cast<size_t>(finding.place.column), line.size());
  const std::string number = std::to_string(finding.place.line + 1);
  const std::string margin(std::max<size_t>(number.size(), 4), ' ');
  const size_t width = Tools::displayWidth(Tools::printable(line.substr(0, column)));
  return margin.substr(number.size()) + number + " | " + Tools::printable(line) + "\n" + margin +
         " | " + std::string(width, ' ') + "^\n";
}

std::string detail(const char *label, const std::string &text) {
  return text.empty() ? "" : std::string("     = ") + label + Tools::printable(text) + "\n";
}

}  // namespace

std::string findingText(const Finding &finding, const Sources &sources) {
  std::string text = Tools::printable(finding.file);
  if (finding.place.line >= 0) {
    text += ":" + std::to_string(finding.place.line + 1) + ":" +
            std::to_string(finding.place.column + 1);
  }
  text += std::string(": ") + nameOf(finding.severity) + ": " + Tools::printable(finding.message) +
          " [" + finding.code + "]\n";
  return text + excerpt(finding, sources) + detail("expected: ", finding.expected) +
         detail("", finding.advice);
}

std::string findingsJson(const Findings &findings, const Sources &sources,
                         const std::vector<std::string> &notes) {
  using Json = nlohmann::ordered_json;
  Json list = Json::array();
  for (const Finding &finding : findings) {
    Json entry = {{"severity", nameOf(finding.severity)},
                  {"code", finding.code},
                  {"file", finding.file},
                  {"line", finding.place.line + 1},
                  {"column", finding.place.line < 0 ? 0 : finding.place.column + 1},
                  {"source", std::string(sourceLine(finding, sources))},
                  {"pool", finding.pool},
                  {"message", finding.message},
                  {"expected", finding.expected},
                  {"advice", finding.advice},
                  {"refusedAt", finding.severity != Severity::kError ? ""
                                : finding.isAtLoad                   ? "load"
                                                                     : "read"}};
    list.push_back(std::move(entry));
  }
  const Json document = {{"findings", list},
                         {"errors", count(findings, Severity::kError)},
                         {"warnings", count(findings, Severity::kWarning)},
                         {"notes", notes}};
  return document.dump(2, ' ', false, Json::error_handler_t::replace) + "\n";
}

size_t count(const Findings &findings, Severity severity) {
  return static_cast<size_t>(
      std::count_if(findings.begin(), findings.end(),
                    [severity](const Finding &finding) { return finding.severity == severity; }));
}

}  // namespace Plan
