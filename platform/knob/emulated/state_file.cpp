// SPDX-License-Identifier: Apache-2.0
// The state as a file: its place, rights, locks and settings of SQLite.
#include "knob/emulated/state_file.h"

#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "common/build_database.h"
#include "common/lock_holder.h"
#include "knob/emulated/schema.h"
#include "knob/kernel.h"

namespace Knob {
namespace {

using Platform::Database;
using Platform::SqliteError;

// How long a call waits for another process. Operations last microseconds; only a process that was
// stopped within one keeps the others waiting.
constexpr int kBusySeconds = 20;
constexpr int kBusyMs = kBusySeconds * 1000;

std::string busyText(const std::string &path) {
  // In WAL mode the locks are on the shared memory.
  return path + ": locked by " + Platform::lockHolderText({path + "-shm", path}) +
         " for more than " + std::to_string(kBusySeconds) + " seconds";
}

[[noreturn]] void notUsable(const std::string &path, const std::string &reason) {
  throw KernelError(Status::kKernelNotUsable, path + ": " + reason);
}

[[noreturn]] void systemFailure(const std::string &path, const char *tried, int error) {
  notUsable(path, std::string("cannot ") + tried + ": " + std::strerror(error));
}

// Makes the folder when it is missing. Only its owner may have rights to change what is in it.
void requireOwnFolder(const std::string &folder, mode_t mode) {
  if (::mkdir(folder.c_str(), mode) != 0 && errno != EEXIST) {
    systemFailure(folder, "make the folder", errno);
  }
  struct stat status {};
  if (::lstat(folder.c_str(), &status) != 0) systemFailure(folder, "look at the folder", errno);
  if (!S_ISDIR(status.st_mode)) notUsable(folder, "is not a folder");
  if (status.st_uid != ::geteuid()) notUsable(folder, "belongs to another user");
  if ((status.st_mode & 0777 & ~mode) != 0) {
    notUsable(folder, "other users have rights on it: remove it, or take their rights away");
  }
}

std::string environmentPath(const char *variable) {
  const char *value = ::secure_getenv(variable);
  return value != nullptr && *value == '/' ? value : "";
}

std::string folderOf(const std::string &path) {
  const size_t slash = path.rfind('/');
  if (slash == std::string::npos) return ".";
  return slash == 0 ? "/" : path.substr(0, slash);
}

void removeIfThere(const std::string &path) {
  if (::unlink(path.c_str()) != 0 && errno != ENOENT) systemFailure(path, "remove", errno);
}

void requireVersion(Database &database, const std::string &path) {
  Platform::Statement statement(database, "SELECT version FROM kernel");
  Platform::Query query(statement);
  if (!query.step()) notUsable(path, "is damaged: it has no version");
  const int64_t version = query.integer(0);
  if (version != kStateVersion) {
    notUsable(path, "is a state of version " + std::to_string(version) + ", this library has " +
                        std::to_string(kStateVersion));
  }
}

}  // namespace

std::string defaultStatePath() {
  constexpr mode_t kForAllToSee = 0755;
  constexpr mode_t kPrivate = 0700;
  std::string folder;
  mode_t mode = kPrivate;
  if (::geteuid() == 0) {
    folder = "/run/knob";
    mode = kForAllToSee;
  } else if (const std::string runtime = environmentPath("XDG_RUNTIME_DIR"); !runtime.empty()) {
    folder = runtime + "/knob";
  } else {
    const std::string temporary = environmentPath("TMPDIR");
    folder = (temporary.empty() ? "/tmp" : temporary) + "/knob-" + std::to_string(::geteuid());
  }
  requireOwnFolder(folder, mode);
  return folder + "/kernel.db";
}

std::string emulatedStatePath(const Configuration &configuration) {
  return configuration.statePath ? *configuration.statePath : defaultStatePath();
}

bool stateExists(const std::string &path) {
  struct stat status {};
  if (::stat(path.c_str(), &status) != 0) {
    if (errno == ENOENT) return false;
    systemFailure(path, "look at the state", errno);
  }
  if (!S_ISREG(status.st_mode)) notUsable(path, "is not a regular file");
  return status.st_size > 0;
}

BootLock::BootLock(const std::string &statePath) {
  // The folder itself is locked: a lock file would have to be left behind.
  const std::string folder = folderOf(statePath);
  folder_ = Platform::UniqueFd(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!folder_) systemFailure(folder, "open the folder", errno);
  while (::flock(folder_.get(), LOCK_EX) != 0) {
    if (errno != EINTR) systemFailure(folder, "lock the folder", errno);
  }
}

void buildState(const BootLock & /*held*/, const std::string &path,
                const std::function<void(Database &)> &fill) {
  const std::string beside = path + ".boot";
  Platform::buildDatabase(beside, [&](Database &database) {
    database.execute("PRAGMA synchronous = OFF");  // the finished file is flushed once
    database.execute(kStatePragmas);
    database.execute("BEGIN");
    database.execute(kStateTables);
    fill(database);
    database.execute("COMMIT");
  });
  try {
    // The log of an earlier state would be taken for part of the new one.
    removeIfThere(path + "-wal");
    removeIfThere(path + "-shm");
    if (::rename(beside.c_str(), path.c_str()) != 0) systemFailure(path, "put the state", errno);
  } catch (...) {
    Platform::removeDatabase(beside);
    throw;
  }
}

Database openState(const std::string &path) {
  try {
    Database database(path, Database::Mode::kReadWrite, kBusyMs);
    // Like a kernel's memory, the state need not outlive the machine.
    database.execute("PRAGMA synchronous = OFF");
    database.execute("PRAGMA cache_size = -16384");
    requireVersion(database, path);
    return database;
  } catch (const SqliteError &error) {
    if (error.code == SQLITE_ERROR) notUsable(path, "is not a state of a kernel");
    if (error.code == SQLITE_BUSY) throw KernelError(Status::kKernelNotUsable, busyText(path));
    notUsable(path, std::string("cannot use the state: ") + error.what());
  }
}

void throwStateError(const std::string &path, const SqliteError &error) {
  const std::string text = path + ": " + error.what();
  switch (error.code) {
    case SQLITE_CORRUPT:
    case SQLITE_NOTADB:
    case SQLITE_CANTOPEN:
      throw KernelError(Status::kKernelNotUsable, text);
    case SQLITE_BUSY:
      throw KernelError(Status::kFailure, busyText(path));
    case SQLITE_READONLY:
    case SQLITE_PERM:
      throw KernelError(Status::kPermissionDenied, text);
    default:
      throw KernelError(Status::kFailure, text);
  }
}

}  // namespace Knob
