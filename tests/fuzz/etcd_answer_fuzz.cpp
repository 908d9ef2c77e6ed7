// SPDX-License-Identifier: Apache-2.0
// Any text as what an etcd member answers, as the value of a key, and as a key. Whatever is wrong
// with it is one of two exceptions; everything else that is thrown ends the run.
#include <cstdint>
#include <cstdlib>
#include <string>

#include "kestrel/etcd/object_key.h"
#include "kestrel/etcd/object_value.h"
#include "kestrel/etcd/protocol.h"

namespace {

using Kestrel::Fields;
using Kestrel::ValueError;
namespace Etcd = Kestrel::Etcd;

template <typename Read>
void tryReading(const Read &read) {
  try {
    (void)read();
  } catch (const Etcd::ProtocolError &) {
    // No answer of etcd's.
  }
}

// What can be read can be written, and is then read as the same.
void readAsValue(const std::string &text) {
  try {
    const Fields fields = Etcd::parseFields(text);
    if (Etcd::parseFields(Etcd::formatFields(fields)) != fields) std::abort();
  } catch (const ValueError &) {
    // No object's value.
  }
}

void readAsKey(const std::string &text) {
  const auto id = Etcd::objectId("/p", text);
  if (id && Etcd::objectKey("/p", *id) != text) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t *data, size_t size) {
  const std::string text(reinterpret_cast<const char *>(data), size);
  tryReading([&] { return Etcd::readRange(text); });
  tryReading([&] { return Etcd::readChange(text); });
  tryReading([&] { return Etcd::readHeader(text); });
  tryReading([&] { return Etcd::readDeleted(text); });
  tryReading([&] { return Etcd::readToken(text); });
  tryReading([&] { return Etcd::readStatus(text); });
  tryReading([&] { return Etcd::readRefusal(text); });
  readAsValue(text);
  readAsKey("/p/global/" + text);
  return 0;
}
