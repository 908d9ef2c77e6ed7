// SPDX-License-Identifier: Apache-2.0
// The order matters: second names, journal, changes, journal removed, second names removed. As long
// as there is a journal, each entry that it names can be put back; once it is gone, the changes are
// permanent. The folder is written to the disk between these steps.
#include "entry_changes.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <exception>
#include <iostream>
#include <stdexcept>

#include "files.h"

namespace Install {
namespace {

constexpr const char *kJournal = ".install.journal";
constexpr const char *kNewJournal = ".install.journal.new";
constexpr const char kBackupPrefix[] = ".old.";

// ".old.PID.NUMBER"
bool isBackup(const std::string &name) {
  const size_t prefix = sizeof kBackupPrefix - 1;
  return name.compare(0, prefix, kBackupPrefix) == 0 && name.size() > prefix &&
         name.find_first_not_of("0123456789.", prefix) == std::string::npos;
}

void unlinkIfThere(const DefinitionFolder &folder, const std::string &name) {
  if (unlinkat(folder.fd(), name.c_str(), 0) != 0 && errno != ENOENT)
    throwSystemError(DefinitionFolder::pathOf(name));
}

std::string contentOf(int file, const std::string &path) {
  std::string content;
  char buffer[4096];
  for (;;) {
    const ssize_t size = read(file, buffer, sizeof buffer);
    if (size == 0) return content;
    if (size > 0) content.append(buffer, static_cast<size_t>(size));
    if (size < 0 && errno != EINTR) throwSystemError(path);
  }
}

}  // namespace

bool EntryChanges::recover(const DefinitionFolder &folder) {
  const std::vector<Entry> entries = readJournal(folder);
  undo(folder, entries);
  folder.sync();
  unlinkIfThere(folder, kJournal);
  folder.sync();
  for (const std::string &name : folder.entries()) {
    if (StagedFile::isTemporary(name) || isBackup(name) || name == kNewJournal)
      unlinkIfThere(folder, name);
  }
  return !entries.empty();
}

EntryChanges::EntryChanges(const DefinitionFolder &folder, const std::vector<std::string> &names)
    : folder_(folder) {
  try {
    for (const std::string &name : names) backUp(name);
    writeJournal();
  } catch (...) {
    (void)unlinkat(folder_.fd(), kNewJournal, 0);
    (void)unlinkat(folder_.fd(), kJournal, 0);
    removeBackups(folder_, entries_);
    throw;
  }
  pending_ = true;
}

EntryChanges::~EntryChanges() {
  if (!pending_) return;
  try {
    undo(folder_, entries_);
    folder_.sync();
    unlinkIfThere(folder_, kJournal);
  } catch (const std::exception &error) {
    std::cerr << "poolctl-install: not undone: " << error.what()
              << "; the next run of poolctl-install tries again" << std::endl;
  }
}

void EntryChanges::backUp(const std::string &name) {
  Entry entry{name,
              kBackupPrefix + std::to_string(getpid()) + "." + std::to_string(entries_.size())};
  if (linkat(folder_.fd(), name.c_str(), folder_.fd(), entry.backup.c_str(), 0) != 0) {
    if (errno != ENOENT) throwSystemError(DefinitionFolder::pathOf(name));
    entry.backup.clear();
  }
  entries_.push_back(entry);
}

// Both texts of each entry, each ended by a NUL byte, which no name has.
void EntryChanges::writeJournal() {
  std::string text;
  for (const Entry &entry : entries_) {
    text += entry.name + '\0';
    text += entry.backup + '\0';
  }
  const std::string path = DefinitionFolder::pathOf(kNewJournal);
  const Platform::UniqueFd file(openat(folder_.fd(), kNewJournal,
                                       O_WRONLY | O_CREAT | O_EXCL | O_CLOEXEC, S_IRUSR | S_IWUSR));
  if (!file) throwSystemError(path);
  writeAll(file.get(), text.data(), text.size(), path);
  if (fsync(file.get()) != 0) throwSystemError(path);
  folder_.sync();
  if (renameat(folder_.fd(), kNewJournal, folder_.fd(), kJournal) != 0)
    throwSystemError(DefinitionFolder::pathOf(kJournal));
  folder_.sync();
}

std::vector<EntryChanges::Entry> EntryChanges::readJournal(const DefinitionFolder &folder) {
  const std::string path = DefinitionFolder::pathOf(kJournal);
  const Platform::UniqueFd file(
      openat(folder.fd(), kJournal, O_RDONLY | O_NONBLOCK | O_NOFOLLOW | O_CLOEXEC));
  if (!file) {
    if (errno == ENOENT) return {};
    throwSystemError(path);
  }
  const std::string text = contentOf(file.get(), path);
  std::vector<std::string> fields;
  for (size_t at = 0; at < text.size();) {
    const size_t end = std::min(text.find('\0', at), text.size());
    fields.push_back(text.substr(at, end - at));
    at = end + 1;
  }
  std::vector<Entry> entries;
  for (size_t i = 0; i + 1 < fields.size(); i += 2) {
    const Entry entry{fields[i], fields[i + 1]};
    // Where others may write to the folder, a journal could lead out of it.
    if (entry.name.find('/') != std::string::npos ||
        (!entry.backup.empty() && !isBackup(entry.backup)))
      throw std::runtime_error(path + ": not a journal of poolctl-install; remove it");
    entries.push_back(entry);
  }
  return entries;
}

// May be repeated: an entry that was put back has no second name any more. An entry that cannot be
// put back does not keep the others from it.
void EntryChanges::undo(const DefinitionFolder &folder, const std::vector<Entry> &entries) {
  std::exception_ptr failure;
  for (auto entry = entries.rbegin(); entry != entries.rend(); ++entry) {
    try {
      undoOne(folder, *entry);
    } catch (...) {
      if (failure == nullptr) failure = std::current_exception();
    }
  }
  if (failure != nullptr) std::rethrow_exception(failure);
}

// Where both names belong to one file, rename() does nothing and leaves both.
void EntryChanges::undoOne(const DefinitionFolder &folder, const Entry &entry) {
  if (entry.backup.empty()) {
    unlinkIfThere(folder, entry.name);
    return;
  }
  if (renameat(folder.fd(), entry.backup.c_str(), folder.fd(), entry.name.c_str()) != 0 &&
      errno != ENOENT)
    throwSystemError(DefinitionFolder::pathOf(entry.name));
  unlinkIfThere(folder, entry.backup);
}

void EntryChanges::removeBackups(const DefinitionFolder &folder,
                                 const std::vector<Entry> &entries) {
  for (const Entry &entry : entries) {
    if (!entry.backup.empty()) (void)unlinkat(folder.fd(), entry.backup.c_str(), 0);
  }
}

void EntryChanges::replace(const std::string &name, StagedFile &file) {
  file.placeAs(name);
}

void EntryChanges::remove(const std::string &name) {
  if (unlinkat(folder_.fd(), name.c_str(), 0) != 0)
    throwSystemError(DefinitionFolder::pathOf(name));
}

void EntryChanges::keep() {
  folder_.sync();
  unlinkIfThere(folder_, kJournal);
  folder_.sync();
  pending_ = false;
  removeBackups(folder_, entries_);
}

}  // namespace Install
