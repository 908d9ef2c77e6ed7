// SPDX-License-Identifier: Apache-2.0
// Looks one field up as any program does, through libkestrelconfig alone, and prints the result or
// the exception; after that, what the process has mapped. The library's calls of syslog() come to
// this program and are printed.
//
// usage: store_probe COMPONENT GROUP KEY FIELD [THREADS]
// With THREADS, so many threads look the field up 50 times each, every time with a store of their
// own, and the number of integers that they found is printed instead.
#include <atomic>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <fstream>
#include <iostream>
#include <string>
#include <thread>
#include <vector>

#include "platform/kestrel_config_store.h"

namespace {

using KestrelConfigStore::ConfigStore;
using KestrelConfigStore::ConfigStoreException;
using KestrelConfigStore::ConfigStoreObjectId;
using KestrelConfigStore::InvalidTypeException;
using KestrelConfigStore::sGlobalNamespace;

void lookUp(const ConfigStoreObjectId &id, const char *field) {
  const auto store = ConfigStore::GetStore(sGlobalNamespace);
  if (!store) {
    std::cout << "no store\n";
    return;
  }
  const auto object = store->GetObject(id);
  if (!object) {
    std::cout << "no object\n";
    return;
  }
  long integer = 0;
  double real = 0;
  try {
    if (!object->GetValue(field, &integer)) {
      std::cout << "no field\n";
    } else {
      std::cout << "integer " << integer << '\n';
    }
  } catch (const InvalidTypeException &) {
    if (object->GetValue(field, &real)) std::cout << "real " << real << '\n';
  }
}

}  // namespace

void printLog(const char *format, va_list arguments) {
  (void)std::printf("log: ");
  (void)std::vprintf(format, arguments);
  (void)std::printf("\n");
}

// These take the place of the C library's functions for the libraries of this process. The second
// one is what a hardened build calls.
extern "C" __attribute__((visibility("default"))) void syslog(int, const char *format, ...) {
  va_list arguments;
  va_start(arguments, format);
  printLog(format, arguments);
  va_end(arguments);
}

// NOLINTNEXTLINE(bugprone-reserved-identifier): the name is the C library's
extern "C" __attribute__((visibility("default"))) void __syslog_chk(int, int, const char *format,
                                                                    ...) {
  va_list arguments;
  va_start(arguments, format);
  printLog(format, arguments);
  va_end(arguments);
}

int lookUpInThreads(const ConfigStoreObjectId &id, const char *field, int count) {
  std::atomic<int> found{0};
  std::vector<std::thread> threads;
  for (int i = 0; i < count; ++i) {
    threads.emplace_back([&] {
      for (int round = 0; round < 50; ++round) {
        long integer = 0;
        const auto object = ConfigStore::GetStore(sGlobalNamespace)->GetObject(id);
        if (object && object->GetValue(field, &integer)) ++found;
      }
    });
  }
  for (std::thread &thread : threads) thread.join();
  std::cout << found << '\n';
  return 0;
}

int main(int argc, char **argv) {
  if (argc != 5 && argc != 6) return 2;
  const ConfigStoreObjectId id{argv[3], argv[1], argv[2], ""};
  if (argc == 6) return lookUpInThreads(id, argv[4], std::atoi(argv[5]));
  try {
    lookUp(id, argv[4]);
  } catch (const InvalidTypeException &error) {
    std::cout << "InvalidTypeException: " << error.what() << '\n';
  } catch (const ConfigStoreException &error) {
    std::cout << "ConfigStoreException: " << error.what() << '\n';
  } catch (const std::exception &error) {
    std::cout << "std::exception: " << error.what() << '\n';
  }
  std::cout << std::ifstream("/proc/self/maps").rdbuf();
  return 0;
}
