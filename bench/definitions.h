// SPDX-License-Identifier: Apache-2.0
// Definition files of any size, like those of a large host.
#pragma once

#include <cstddef>
#include <string>

namespace Bench {

// Writes a file of that many pools: services of up to 49 parts each, a parent before its parts,
// with plain values and expressions mixed. They need a host of 2 MB for each pool.
void writeDefinitions(const std::string &path, std::size_t pools);

}  // namespace Bench
