// SPDX-License-Identifier: Apache-2.0
// Messages: what reaches standard error, and in how many system calls. The system's writev is this
// program's own here.
#include "console/message.h"

#include <gtest/gtest.h>
#include <pty.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <string>

namespace {

std::string written;
int calls;
int interruptions;  // calls that fail with EINTR first
size_t mostBytes;   // that one call takes
bool failing;

}  // namespace

extern "C" ssize_t writev(int fd, const iovec *parts, int count) {
  EXPECT_EQ(STDERR_FILENO, fd);
  ++calls;
  if (interruptions > 0) {
    --interruptions;
    errno = EINTR;
    return -1;
  }
  if (failing) {
    errno = ENOSPC;
    return -1;
  }
  size_t total = 0;
  for (int i = 0; i < count && total < mostBytes; ++i) {
    const size_t length = std::min(parts[i].iov_len, mostBytes - total);
    written.append(static_cast<const char *>(parts[i].iov_base), length);
    total += length;
  }
  return static_cast<ssize_t>(total);
}

namespace {

class Message : public testing::Test {
 protected:
  Message() {
    written.clear();
    calls = interruptions = 0;
    mostBytes = SIZE_MAX;
    failing = false;
  }
};

// Makes standard error a terminal.
class MessageOnATerminal : public Message {
 protected:
  void SetUp() override {
    int terminal = -1;
    ASSERT_EQ(0, openpty(&master_, &terminal, nullptr, nullptr, nullptr));
    saved_ = dup(STDERR_FILENO);
    dup2(terminal, STDERR_FILENO);
    close(terminal);
  }
  void TearDown() override {
    dup2(saved_, STDERR_FILENO);
    close(saved_);
    close(master_);
  }

 private:
  int saved_ = -1;
  int master_ = -1;
};

TEST_F(Message, IsOneSystemCall) {
  Console::printError("host/opt/a", std::string(": "), std::string(100000, 'x'));
  EXPECT_EQ("host/opt/a: " + std::string(100000, 'x') + "\n", written);
  EXPECT_EQ(1, calls);
}

TEST_F(Message, KeepsControlCharactersForScripts) {
  Console::printError("a\x1b[31m\tb");
  EXPECT_EQ("a\x1b[31m\tb\n", written);
}

TEST_F(Message, IsContinuedAfterAShortWrite) {
  for (const size_t bytes : {1U, 2U, 3U, 5U}) {
    written.clear();
    mostBytes = bytes;
    Console::printError("ab", "", "cde");
    EXPECT_EQ("abcde\n", written) << bytes;
  }
}

TEST_F(Message, IsWrittenAfterAnInterruption) {
  interruptions = 2;
  Console::printError("a");
  EXPECT_EQ("a\n", written);
}

TEST_F(Message, ThatCannotBeWrittenIsGivenUp) {
  failing = true;
  Console::printError("a");
  EXPECT_EQ(1, calls);
}

TEST_F(Message, UsageIsOneSystemCallAsItIs) {
  Console::printUsage("one\n    two\n");
  EXPECT_EQ("one\n    two\n", written);
  EXPECT_EQ(1, calls);
}

TEST_F(MessageOnATerminal, HasItsControlCharactersEscaped) {
  Console::printError("a\n", "\x1b[31m\u009b", "\u00e9");
  EXPECT_EQ("a\\x0a\\x1b[31m\\xc2\\x9b\u00e9\n", written);
}

TEST_F(MessageOnATerminal, MayBeLongerThanTheBuffer) {
  for (const size_t length : {1024U, 4090U, 4095U, 4096U, 4097U, 20000U}) {
    written.clear();
    Console::printError(std::string(length, 'x'), "\x1b", "y");
    EXPECT_EQ(std::string(length, 'x') + "\\x1by\n", written) << length;
    written.clear();
    Console::printError(std::string(length, '\x1b'));
    EXPECT_EQ(length * 4 + 1, written.size());
  }
}

TEST_F(MessageOnATerminal, UsageKeepsItsLines) {
  Console::printUsage("one\n    two\n");
  EXPECT_EQ("one\n    two\n", written);
}

}  // namespace
