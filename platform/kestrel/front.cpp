// SPDX-License-Identifier: Apache-2.0
// What libkestrelconfig exports: the public classes on top of the store that the configuration
// names. A process reads its configuration once.
#include <unistd.h>

#include <cstdlib>
#include <mutex>
#include <utility>

#include "kestrel/open.h"
#include "kestrel/run_account.h"
#include "platform/kestrel_config_store.h"

namespace KestrelConfigStore {

const std::string sGlobalNamespace = "global";

}  // namespace KestrelConfigStore

namespace Kestrel {

namespace {

using KestrelConfigStore::ConfigStore;
using KestrelConfigStore::ConfigStoreException;
using KestrelConfigStore::InvalidTypeException;
using KestrelConfigStore::StoreObject;

void count(long RunCounts::*what);

// The fields of one object at the moment of its lookup.
class Snapshot : public StoreObject {
 public:
  explicit Snapshot(Fields fields) : fields_(std::move(fields)) {}

  bool GetValue(const char *field, long *value) const override {
    static_assert(sizeof(long) == sizeof(int64_t));
    const auto *found = find(field);
    if (found == nullptr) return false;
    const auto *integer = std::get_if<int64_t>(&found->second);
    if (integer == nullptr) refuse(*found, "an integer");
    *value = *integer;
    count(&RunCounts::values);
    return true;
  }

  bool GetValue(const char *field, double *value) const override {
    const auto *found = find(field);
    if (found == nullptr) return false;
    if (const auto *integer = std::get_if<int64_t>(&found->second)) {
      *value = static_cast<double>(*integer);
    } else if (const auto *real = std::get_if<double>(&found->second)) {
      *value = *real;
    } else {
      // Programs read a field as an integer first: only this second read is a lookup without value.
      count(&RunCounts::defaults);
      refuse(*found, "a number");
    }
    count(&RunCounts::values);
    return true;
  }

 private:
  const Fields::value_type *find(const char *field) const {
    const auto found = fields_.find(field);
    if (found != fields_.end()) return &*found;
    count(&RunCounts::defaults);
    return nullptr;
  }

  [[noreturn]] static void refuse(const Fields::value_type &field, const char *wanted) {
    throw InvalidTypeException("field \"" + field.first + "\" is of type " +
                               std::string(typeName(typeOf(field.second))) + ", not " + wanted);
  }

  Fields fields_;
};

// The store that a process has open. Threads share it.
struct OpenStore {
  std::mutex mutex;  // one thread at a time uses the backend
  std::shared_ptr<Backend> backend;
};

// One run: the configuration that a process has read, once, and the store that it names. A child
// process begins a run of its own: neither SQLite nor a connection to a server can be shared with
// its parent.
class RunOfProcess {
 public:
  RunOfProcess() : process_(getpid()), file_(configurationFile()) {
    try {
      configuration_ = readConfiguration();
    } catch (const ConfigStoreException &error) {
      problem_ = error.what();
    }
  }

  bool isThisOne() const { return isThisProcess() && file_ == configurationFile(); }
  bool isThisProcess() const { return process_ == getpid(); }

  // Null: the store does not exist. A failure to open an etcd store lasts for the run.
  std::shared_ptr<OpenStore> store() {
    if (!problem_.empty()) throw ConfigStoreException(problem_);
    if (open_) {
      const std::lock_guard<std::mutex> lock(open_->mutex);
      if (open_->backend->current()) return open_;
    }
    open_.reset();
    try {
      auto backend = openBackend(configuration_, Access::kRead);
      if (!backend) return nullptr;
      open_ = std::make_shared<OpenStore>();
      open_->backend = std::move(backend);
      return open_;
    } catch (const ConfigStoreException &error) {
      if (configuration_.engine == Engine::kEtcd) problem_ = error.what();
      throw;
    }
  }

  void count(long RunCounts::*what) { ++(counts_.*what); }
  void countFailure(const char *why) {
    ++counts_.failures;
    if (counts_.error.empty()) counts_.error = why;
  }

  void report() {
    RunSource source;
    source.name = "none";
    if (open_) {
      const std::lock_guard<std::mutex> lock(open_->mutex);
      source = open_->backend->source();
    }
    reportRun(configuration_, counts_, source);
  }

 private:
  pid_t process_;
  std::string file_;
  std::string problem_;  // why the run has no store; empty: it may have one
  Configuration configuration_;
  std::shared_ptr<OpenStore> open_;
  RunCounts counts_;
};

// Never destroyed: exit handlers may still read, and the exit of a child process must not close
// what is its parent's.
struct Runs {
  std::mutex mutex;
  RunOfProcess *present = nullptr;
};

Runs &runs() {
  static auto &runs = *new Runs;
  return runs;
}

void reportAtExit() {
  const std::lock_guard<std::mutex> lock(runs().mutex);
  if (runs().present != nullptr && runs().present->isThisProcess()) runs().present->report();
}

// The caller holds the mutex of the runs.
RunOfProcess &presentRun() {
  Runs &all = runs();
  if (all.present == nullptr) (void)std::atexit(reportAtExit);
  if (all.present == nullptr || !all.present->isThisOne()) {
    if (all.present != nullptr && all.present->isThisProcess()) delete all.present;
    all.present = new RunOfProcess;
  }
  return *all.present;
}

void count(long RunCounts::*what) {
  const std::lock_guard<std::mutex> lock(runs().mutex);
  presentRun().count(what);
}

// Runs one lookup of a program and counts its failure.
template <typename LookUp>
auto counted(const LookUp &lookUp) {
  try {
    return lookUp();
  } catch (const ConfigStoreException &error) {
    const std::lock_guard<std::mutex> lock(runs().mutex);
    presentRun().countFailure(error.what());
    throw;
  }
}

std::shared_ptr<OpenStore> openStore() {
  return counted([] {
    const std::lock_guard<std::mutex> lock(runs().mutex);
    return presentRun().store();
  });
}

class Store : public ConfigStore {
 public:
  explicit Store(std::shared_ptr<OpenStore> open) : open_(std::move(open)) {}

  std::shared_ptr<StoreObject> GetObject(const ObjectId &id) override {
    auto fields = counted([&] {
      const std::lock_guard<std::mutex> lock(open_->mutex);
      return open_->backend->lookUp(id);
    });
    if (!fields) count(&RunCounts::defaults);
    if (!fields) return nullptr;
    return std::make_shared<Snapshot>(std::move(*fields));
  }

 private:
  std::shared_ptr<OpenStore> open_;
};

}  // namespace

}  // namespace Kestrel

namespace KestrelConfigStore {

std::shared_ptr<ConfigStore> ConfigStore::GetStore(const std::string &nameSpace) {
  if (nameSpace != sGlobalNamespace) return nullptr;
  auto open = Kestrel::openStore();
  if (!open) return nullptr;
  return std::make_shared<Kestrel::Store>(std::move(open));
}

}  // namespace KestrelConfigStore
