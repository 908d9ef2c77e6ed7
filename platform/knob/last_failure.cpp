// SPDX-License-Identifier: Apache-2.0
// One buffer for each thread, without allocations: the text can be asked for when memory is short.
#include "knob/last_failure.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <exception>
#include <string>

#include "common/printable.h"
#include "common/utf8.h"
#include "knob/status.h"

namespace Knob {
namespace {

// Long enough for a path of the longest file name, short enough for one line of a log.
constexpr size_t kMaxReasonBytes = 400;
constexpr std::string_view kCut = "...";

struct LastFailure {
  uint32_t status = 0;
  std::array<char, kMaxReasonBytes + 1> reason{};  // empty: there is none
  std::array<char, kMaxReasonBytes + 128> text{};
};

thread_local LastFailure last;

// Cuts between characters.
std::string shortened(std::string text) {
  if (text.size() <= kMaxReasonBytes) return text;
  size_t end = 0;
  for (size_t at = 0; at + kCut.size() <= kMaxReasonBytes;) {
    end = at;
    at += std::max<size_t>(Platform::utf8At(text, at).length, 1);
  }
  return text.replace(end, std::string::npos, kCut);
}

}  // namespace

void forgetFailure() noexcept {
  last.reason[0] = '\0';
}

void rememberFailure(uint32_t status, std::string_view reason) noexcept {
  forgetFailure();
  try {
    const std::string line = shortened(Platform::printable(reason));
    *std::copy(line.begin(), line.end(), last.reason.begin()) = '\0';
    last.status = status;
  } catch (const std::exception &) {  // no memory
  }
}

const char *explainedStatusText(uint32_t status) noexcept {
  if (last.reason[0] == '\0' || last.status != status) return statusText(status);
  const std::string_view name = statusName(status);
  (void)std::snprintf(last.text.data(), last.text.size(), "%.*s: %s", static_cast<int>(name.size()),
                      name.data(), last.reason.data());
  return last.text.data();
}

}  // namespace Knob
