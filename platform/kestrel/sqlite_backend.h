// SPDX-License-Identifier: Apache-2.0
// The store in one SQLite file. The tables are the schema's, the opening of the file is
// sqlite_file's; here stands what is read and written.
#pragma once

#include <memory>
#include <string>

#include "kestrel/backend.h"
#include "kestrel/configuration.h"
#include "kestrel/open.h"

namespace Kestrel {

// Empty: there is no such file, and the access does not make one.
std::shared_ptr<Backend> openSqliteBackend(const Configuration &configuration, Access access);

}  // namespace Kestrel
