// SPDX-License-Identifier: Apache-2.0
// The program's streams are anonymous files instead of pipes: it never waits for its reader, and a
// child that it leaves behind does not keep the reader waiting.
#include "process.h"

#include <fcntl.h>
#include <poll.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>
#include <system_error>

#include "common/unique_fd.h"
#include "private_etc.h"

namespace Test {
namespace {

using Platform::UniqueFd;

[[noreturn]] void fail(const std::string &what) {
  throw std::system_error(errno, std::generic_category(), what);
}

UniqueFd anonymousFile(const char *name, const std::string &content = {}) {
  UniqueFd file(memfd_create(name, MFD_CLOEXEC));
  if (file.get() < 0) fail("memfd_create");
  if (write(file.get(), content.data(), content.size()) != static_cast<ssize_t>(content.size()))
    fail("writing the input");
  if (lseek(file.get(), 0, SEEK_SET) < 0) fail("lseek");
  return file;
}

std::string contentOf(const UniqueFd &file) {
  std::string content;
  char buffer[65536];
  off_t offset = 0;
  for (;;) {
    const ssize_t count = pread(file.get(), buffer, sizeof buffer, offset);
    if (count < 0) fail("reading the output");
    if (count == 0) return content;
    content.append(buffer, static_cast<size_t>(count));
    offset += count;
  }
}

std::vector<char *> pointers(std::vector<std::string> &texts) {
  std::vector<char *> result;
  for (std::string &text : texts) result.push_back(text.data());
  result.push_back(nullptr);
  return result;
}

// The steps between fork and exec that can fail. Returns the name of the step that did, or null.
const char *prepareChild(const Command &command, int in, int out, int err) {
  if (setpgid(0, 0) != 0) return "setpgid";
  if (!command.etc.empty()) {
    if (const char *step = enterPrivateEtc(command.etc)) return step;
  }
  if (chdir(command.workingFolder.c_str()) != 0) return "chdir";
  if (dup2(in, 0) < 0 || dup2(out, 1) < 0 || dup2(err, 2) < 0) return "dup2";
  return nullptr;
}

// True when the process has ended within the limit.
bool endsWithin(pid_t pid, std::chrono::milliseconds limit) {
  const UniqueFd handle(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
  if (handle.get() < 0) fail("pidfd_open");
  const auto end = std::chrono::steady_clock::now() + limit;
  for (;;) {
    const auto left = std::chrono::duration_cast<std::chrono::milliseconds>(
        end - std::chrono::steady_clock::now());
    if (left.count() < 0) return false;
    pollfd wait{handle.get(), POLLIN, 0};
    const int ready = poll(&wait, 1, static_cast<int>(left.count()) + 1);
    if (ready > 0) return true;
    if (ready < 0 && errno != EINTR) fail("poll");
  }
}

}  // namespace

ProcessResult run(const Command &command) {
  const UniqueFd in = anonymousFile("stdin", command.input);
  const UniqueFd out = anonymousFile("stdout");
  const UniqueFd err = anonymousFile("stderr");
  for (const UniqueFd *file : {&out, &err})
    if (fcntl(file->get(), F_SETFL, O_APPEND) != 0) fail("fcntl");
  std::vector<std::string> arguments{command.program.string()}, environment;
  arguments.insert(arguments.end(), command.arguments.begin(), command.arguments.end());
  for (const auto &[name, value] : command.environment) environment.push_back(name + "=" + value);
  const std::vector<char *> argv = pointers(arguments), envp = pointers(environment);
  const int second = command.streams == Streams::kMerged ? out.get() : err.get();

  const pid_t pid = fork();
  if (pid < 0) fail("fork");
  if (pid == 0) {
    const char *step = prepareChild(command, in.get(), out.get(), second);
    if (step == nullptr) {
      execve(command.program.c_str(), argv.data(), envp.data());
      step = "execve";
    }
    dprintf(err.get(), "starting %s: %s: %s\n", command.program.c_str(), step, strerror(errno));
    _exit(127);
  }
  setpgid(pid, pid);  // parent and child both do it, so that it is done before either continues

  ProcessResult result;
  result.timedOut = !endsWithin(pid, command.limit);
  kill(-pid, SIGKILL);  // the program itself at its limit, or what it left behind
  int status = 0;
  while (waitpid(pid, &status, 0) < 0)
    if (errno != EINTR) fail("waitpid");
  if (WIFEXITED(status)) result.status = WEXITSTATUS(status);
  if (WIFSIGNALED(status)) result.signal = WTERMSIG(status);
  result.out = contentOf(out);
  result.err = contentOf(err);
  return result;
}

}  // namespace Test
