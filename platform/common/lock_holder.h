// SPDX-License-Identifier: Apache-2.0
// Which process keeps the others waiting.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <optional>
#include <string>

namespace Platform {

// The process that holds a lock for writing on a file, by the running kernel's list of locks.
// Empty when only this process holds it, or when the list does not show it: a process of
// another container, or a file system whose device number the list does not have.
std::optional<int64_t> writeLockHolder(const std::string &file);

// "process 123 (name)" for the holder of one of the files, or "another process".
std::string lockHolderText(std::initializer_list<std::string> files);

}  // namespace Platform
