// SPDX-License-Identifier: Apache-2.0
// The tables of the emulated kernel's state. Whoever changes them raises the version: a library
// leaves a state of another version alone.
#pragma once

#include <cstdint>

#include "knob/kernel.h"

namespace Knob {

inline constexpr int64_t kStateVersion = 1;

inline constexpr GroupId kHostId = 1;
inline constexpr GroupId kOptId = 2;

// Small pages: an operation changes a few rows here and there, and every changed page is written
// whole.
inline constexpr const char *kStatePragmas = R"(
PRAGMA page_size = 1024;
PRAGMA journal_mode = WAL;
)";

// An allocation's columns default to those of a new group. *_children are the sums of the
// children's reservations, kept with every change. Ids grow and are never given twice.
inline constexpr const char *kStateTables = R"(
CREATE TABLE kernel (
  one INTEGER PRIMARY KEY CHECK (one = 1),
  version INTEGER NOT NULL,
  cpus INTEGER NOT NULL,
  memory_kb INTEGER NOT NULL,
  max_vms INTEGER,
  is_vm INTEGER NOT NULL,
  command_line TEXT NOT NULL,
  md5 TEXT NOT NULL,
  build_date TEXT NOT NULL
);
CREATE TABLE groups (
  id INTEGER PRIMARY KEY AUTOINCREMENT,
  parent INTEGER NOT NULL,
  name TEXT NOT NULL,
  mem_min INTEGER NOT NULL DEFAULT 0,
  mem_max INTEGER NOT NULL DEFAULT -1,
  mem_limit INTEGER NOT NULL DEFAULT -1,
  mem_shares INTEGER NOT NULL DEFAULT -3,
  mem_children INTEGER NOT NULL DEFAULT 0,
  cpu_min INTEGER NOT NULL DEFAULT 0,
  cpu_max INTEGER NOT NULL DEFAULT -1,
  cpu_limit INTEGER NOT NULL DEFAULT -1,
  cpu_shares INTEGER NOT NULL DEFAULT -3,
  cpu_children INTEGER NOT NULL DEFAULT 0,
  own_peak_kb INTEGER NOT NULL DEFAULT 0,
  children_peak_kb INTEGER NOT NULL DEFAULT 0,
  UNIQUE (parent, name)
);
CREATE TABLE members (
  pid INTEGER PRIMARY KEY,
  started INTEGER NOT NULL,
  grp INTEGER NOT NULL
);
CREATE INDEX members_by_group ON members (grp);
)";

// What every boot begins with. The ids of groups that were are not forgotten.
inline constexpr const char *kEmptyTree = R"(
DELETE FROM kernel;
DELETE FROM members;
DELETE FROM groups;
INSERT INTO groups (id, parent, name) VALUES (1, 0, 'host'), (2, 1, 'opt');
)";

}  // namespace Knob
