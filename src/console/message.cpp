// SPDX-License-Identifier: Apache-2.0
#include "console/message.h"

#include <sys/uio.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <cstddef>

#include "console/printable.h"

namespace Console {
namespace {

iovec vectorOf(std::string_view text) {
  return {const_cast<char *>(text.data()), text.size()};
}

// Removes the first WRITTEN bytes.
void advance(iovec *&part, iovec *end, size_t written) {
  while (part != end && written >= part->iov_len) written -= (part++)->iov_len;
  if (part == end) return;
  part->iov_base = static_cast<char *>(part->iov_base) + written;
  part->iov_len -= written;
}

void writeAll(iovec *part, iovec *end) {
  while (part != end) {
    const ssize_t written = writev(STDERR_FILENO, part, static_cast<int>(end - part));
    if (written < 0 && errno == EINTR) continue;
    if (written <= 0) return;
    advance(part, end, static_cast<size_t>(written));
  }
}

// Collects text for a terminal without needing memory.
class TerminalLine {
 public:
  ~TerminalLine() { flush(); }

  void add(std::string_view text) {
    while (!text.empty()) {
      const Character character = firstCharacter(text);
      for (size_t i = 0; i < character.length; ++i) addByte(text[i], character.isControl);
      text.remove_prefix(character.length);
    }
  }
  void end() { addByte('\n', false); }

 private:
  void addByte(char byte, bool escaped) {
    if (buffer_.size() - used_ < kEscapeLength) flush();
    if (escaped) {
      writeEscape(static_cast<unsigned char>(byte), buffer_.data() + used_);
      used_ += kEscapeLength;
    } else {
      buffer_[used_++] = byte;
    }
  }
  void flush() {
    iovec all = vectorOf({buffer_.data(), used_});
    if (used_ != 0) writeAll(&all, &all + 1);
    used_ = 0;
  }

  std::array<char, 4096> buffer_;
  size_t used_ = 0;
};

}  // namespace

void printParts(const std::string_view *parts, size_t count) noexcept {
  if (isatty(STDERR_FILENO) == 1) {
    TerminalLine line;
    for (size_t i = 0; i < count; ++i) line.add(parts[i]);
    line.end();
    return;
  }
  std::array<iovec, kMaxParts + 1> vectors;
  for (size_t i = 0; i < count; ++i) vectors[i] = vectorOf(parts[i]);
  vectors[count] = vectorOf("\n");
  writeAll(vectors.data(), vectors.data() + count + 1);
}

void printUsage(std::string_view text) noexcept {
  iovec all = vectorOf(text);
  writeAll(&all, &all + 1);
}

}  // namespace Console
