// SPDX-License-Identifier: Apache-2.0
// Reads events and no nodes, and stops at the first event of the second document: reading all
// documents at once never ends on some texts that are not YAML.
#include "plan_check/second_document.h"

#include <yaml-cpp/eventhandler.h>
#include <yaml-cpp/exceptions.h>
#include <yaml-cpp/parser.h>

#include <sstream>

namespace Plan {
namespace {

struct Found {
  YAML::Mark mark;
};

class Watcher : public YAML::EventHandler {
 public:
  void expectSecond() { second_ = true; }

  void OnDocumentStart(const YAML::Mark &) override {}
  void OnDocumentEnd() override {}
  void OnNull(const YAML::Mark &, YAML::anchor_t) override {}
  void OnAlias(const YAML::Mark &mark, YAML::anchor_t) override { see(mark); }
  void OnScalar(const YAML::Mark &mark, const std::string &, YAML::anchor_t,
                const std::string &) override {
    see(mark);
  }
  void OnSequenceStart(const YAML::Mark &mark, const std::string &, YAML::anchor_t,
                       YAML::EmitterStyle::value) override {
    see(mark);
  }
  void OnSequenceEnd() override {}
  void OnMapStart(const YAML::Mark &mark, const std::string &, YAML::anchor_t,
                  YAML::EmitterStyle::value) override {
    see(mark);
  }
  void OnMapEnd() override {}

 private:
  void see(const YAML::Mark &mark) const {
    if (second_) throw Found{mark};
  }

  bool second_ = false;
};

}  // namespace

YAML::Mark secondDocument(const std::string &text) {
  std::istringstream stream(text);
  YAML::Parser parser(stream);
  Watcher watcher;
  try {
    (void)parser.HandleNextDocument(watcher);
    watcher.expectSecond();
    (void)parser.HandleNextDocument(watcher);
  } catch (const Found &found) {
    return found.mark;
  } catch (const YAML::Exception &error) {
    return error.mark;
  }
  return YAML::Mark::null_mark();
}

}  // namespace Plan
