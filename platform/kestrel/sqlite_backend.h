// SPDX-License-Identifier: Apache-2.0
// The store in one SQLite file: which operation reads or writes what, in which transaction.
// sqlite_tables has the tables, sqlite_file opens the file.
#pragma once

#include <memory>
#include <string>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"
#include "kestrel/open.h"

namespace Kestrel {

// Null: the file does not exist, and the access does not make one.
std::shared_ptr<Backend> openSqliteBackend(const Configuration &configuration, Access access);

}  // namespace Kestrel
