// SPDX-License-Identifier: Apache-2.0
// Runs a part of a test in a process of its own, for what a process does once, or must not undo.
#pragma once

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdio>
#include <cstdlib>
#include <exception>

// Failures in BODY fail the test; what BODY changes is gone with its process.
template <typename Body>
void inOwnProcess(Body body) {
  std::fflush(nullptr);
  const pid_t child = fork();
  ASSERT_GE(child, 0) << "no process";
  if (child == 0) {
    try {
      body();
    } catch (const std::exception &error) {
      ADD_FAILURE() << "thrown: " << error.what();
    }
    std::exit(testing::Test::HasFailure() ? 1 : 0);
  }
  int status = -1;
  ASSERT_EQ(child, waitpid(child, &status, 0));
  EXPECT_TRUE(WIFEXITED(status)) << "ended by signal " << WTERMSIG(status);
  EXPECT_EQ(0, WEXITSTATUS(status)) << "the failures are printed above";
}
