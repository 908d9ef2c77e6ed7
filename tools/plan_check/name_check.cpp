// SPDX-License-Identifier: Apache-2.0
// libknob's own rule decides; the rest finds the reason.
#include "plan_check/name_check.h"

#include "knob/names.h"

namespace Plan {
namespace {

constexpr const char *kExpected =
    "a path such as web or web/cache, below host/opt unless it begins with host/";

NameProblem refused(const std::string &message, const std::string &advice = "") {
  return {true, {"name", message, kExpected, advice, 0}};
}

NameProblem odd(const std::string &message, const std::string &advice = "") {
  return {false, {"name", message, kExpected, advice, 0}};
}

NameProblem refusedComponent(const std::string &component) {
  if (component == "." || component == "..") {
    return refused("\"" + component + "\" cannot be part of a name");
  }
  if (component.find('\n') != std::string::npos || component.find('\0') != std::string::npos) {
    return refused("a name cannot hold a line feed or a NUL", "is a quote not closed?");
  }
  constexpr size_t kMaxComponent = 255;
  if (component.size() > kMaxComponent) return refused("a part of the name is above 255 bytes");
  return refused("\"" + component + "\" begins like a control file of Linux (" +
                 component.substr(0, component.find('.') + 1) + ")");
}

NameProblem whyRefused(const std::string &name, const std::string &path) {
  if (name[0] == '/') {
    const bool host = name.compare(0, 6, "/host/") == 0 || name == "/host";
    return refused("the name begins with \"/\"",
                   "write " + (host ? name.substr(1)
                                    : name.substr(name.find_first_not_of('/') == std::string::npos
                                                      ? name.size()
                                                      : name.find_first_not_of('/'))));
  }
  if (name.back() == '/') return refused("the name ends with \"/\"", "remove it");
  for (size_t start = 0;;) {
    const size_t end = path.find('/', start);
    const std::string component = path.substr(start, end - start);
    if (component.empty()) return refused("the name has two \"/\" in a row");
    if (!Knob::isGroupName(component)) return refusedComponent(component);
    if (end == std::string::npos) break;
    start = end + 1;
  }
  return refused("the kernel does not accept this name");
}

}  // namespace

std::optional<NameProblem> nameProblem(const std::string &name, const std::string &path) {
  if (!Knob::splitPath(path)) return whyRefused(name, path);
  if (path == "host/opt") return odd("host/opt always exists: load never sets it");
  if (name == "host") return odd("this is the pool host/opt/host", "the group host is not a pool");
  if (name.compare(0, 4, "opt/") == 0) {
    return odd("this is the pool host/opt/" + name, "write " + name.substr(4));
  }
  const bool looksAbsolute = name.compare(0, 5, "Host/") == 0 || name.compare(0, 5, "HOST/") == 0;
  if (looksAbsolute) return odd("this is the pool " + path, "write host/" + name.substr(5));
  if (name.find(": ") != std::string::npos || name.find(" #") != std::string::npos) {
    return odd("the name holds \"" + name.substr(name.find_first_of(":#"), 1) + "\"",
               "is a quote not closed?");
  }
  const bool padded =
      name.front() == ' ' || name.back() == ' ' || name.front() == '\t' || name.back() == '\t';
  if (padded) return odd("the name begins or ends with a blank");
  if (name.find_first_of(",;\\") != std::string::npos) {
    const std::string mark(1, name[name.find_first_of(",;\\")]);
    return odd("\"" + mark + "\" is part of the name", mark == "\\" ? "write /" : "remove it");
  }
  return std::nullopt;
}

}  // namespace Plan
