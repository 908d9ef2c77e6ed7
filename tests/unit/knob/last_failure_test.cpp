// SPDX-License-Identifier: Apache-2.0
// The reason of a thread's last failure is one safe line, and never explains another failure.
#include "knob/last_failure.h"

#include <gtest/gtest.h>

#include <string>
#include <thread>

#include "common/utf8.h"
#include "platform/knob_status.h"

namespace Knob {
namespace {

class LastFailure : public testing::Test {
 protected:
  LastFailure() { forgetFailure(); }
};

TEST_F(LastFailure, TheReasonFollowsTheTextOfItsStatus) {
  rememberFailure(KNOB_STATUS_NOT_FOUND, "host/opt/no");
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_NOT_FOUND), "not found: host/opt/no");
}

TEST_F(LastFailure, AReasonReplacesTheUsualOne) {
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_BUSY),
               "busy: child groups or living processes in it");
  rememberFailure(KNOB_STATUS_BUSY, "child groups are in it");
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_BUSY), "busy: child groups are in it");
}

TEST_F(LastFailure, AnotherStatusHasNoReason) {
  rememberFailure(KNOB_STATUS_NOT_FOUND, "host/opt/no");
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_EXISTS), "already exists");
  EXPECT_STREQ(explainedStatusText(0), "success");
}

TEST_F(LastFailure, AForgottenReasonIsNotShown) {
  rememberFailure(KNOB_STATUS_NOT_FOUND, "host/opt/no");
  forgetFailure();
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_NOT_FOUND), "not found");
}

TEST_F(LastFailure, AnEmptyReasonAddsNothing) {
  rememberFailure(KNOB_STATUS_NOT_FOUND, "");
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_NOT_FOUND), "not found");
}

TEST_F(LastFailure, AReasonStaysOneLineWithoutControlBytes) {
  rememberFailure(KNOB_STATUS_NOT_FOUND, "a\nb\x1b[31m\xff");
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_NOT_FOUND), "not found: a\\nb\\x1b[31m\\xff");
}

TEST_F(LastFailure, ALongReasonIsCutBetweenCharacters) {
  std::string reason = "x";
  while (reason.size() < 5000) reason += "\xc3\xbc";
  rememberFailure(KNOB_STATUS_NOT_FOUND, reason);
  const std::string text = explainedStatusText(KNOB_STATUS_NOT_FOUND);
  EXPECT_GT(text.size(), 400U);
  EXPECT_LT(text.size(), 430U);
  EXPECT_EQ(text.substr(text.size() - 3), "...");
  EXPECT_TRUE(Platform::isUtf8(text));
}

TEST_F(LastFailure, EveryLengthAroundTheBoundFits) {
  for (size_t size = 390; size < 410; ++size) {
    rememberFailure(KNOB_STATUS_NOT_FOUND, std::string(size, 'x'));
    const std::string text = explainedStatusText(KNOB_STATUS_NOT_FOUND);
    const std::string reason = text.substr(std::string("not found: ").size());
    EXPECT_LE(reason.size(), 400U) << size;
    if (size <= 400) {
      EXPECT_EQ(reason, std::string(size, 'x'));
    }
  }
}

TEST_F(LastFailure, AThreadSeesItsOwnReasonAlone) {
  rememberFailure(KNOB_STATUS_NOT_FOUND, "mine");
  std::thread([] {
    EXPECT_STREQ(explainedStatusText(KNOB_STATUS_NOT_FOUND), "not found");
    rememberFailure(KNOB_STATUS_NOT_FOUND, "of another thread");
  }).join();
  EXPECT_STREQ(explainedStatusText(KNOB_STATUS_NOT_FOUND), "not found: mine");
}

}  // namespace
}  // namespace Knob
