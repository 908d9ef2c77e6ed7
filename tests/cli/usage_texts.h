// SPDX-License-Identifier: Apache-2.0
// The usage texts, written out a second time: scripts and people rely on every byte.
#pragma once

namespace Test {

constexpr const char *kListUsage =
    "poolctl list [flags] [files...]\n"
    "    List resource pools defined in yaml files. If no files are specified,\n"
    "    all yaml files in /etc/rp.d will be used.\n"
    "Flags:\n"
    "    -v              Use CSV format instead of table.\n";

constexpr const char *kLoadUsage =
    "poolctl load [flags] [files...]\n"
    "    Create enabled resource pools defined in yaml files. If no yaml files\n"
    "    are specified, all files from /etc/rp.d will be used.\n"
    "Flags:\n"
    "    -q              Silence diagnostic messages.\n";

constexpr const char *kUnloadUsage =
    "poolctl unload [files...]\n"
    "    Delete resource pools defined in yaml files. If no yaml files are\n"
    "    specified, all files from /etc/rp.d will be used.\n";

constexpr const char *kEnableUsage =
    "poolctl enable <rps...>\n"
    "    Enable disabled resource pools, which must be defined by files in\n"
    "    /etc/rp.d. A resource pools is considered disabled if it does not\n"
    "    exist or has its memory maximum set to 0. A non-existing pool\n"
    "    is enabled by getting created with settings from the yaml definition.\n"
    "    An existing pool has its memory allocation restored from the yaml\n"
    "    definition.\n";

constexpr const char *kDisableUsage =
    "poolctl disable [flags] <rps...>\n"
    "    Disable and delete resource pools. A pool is disabled by having its\n"
    "    minimum and maximum memory allocation set to zero.\n"
    "Flags:\n"
    "    -w <seconds>    Optionally, wait upto <seconds> per resource pool,\n"
    "                    for it to become unused.\n"
    "    -n              Only disable, do not delete.\n";

constexpr const char *kLegacyUsage =
    "poolctl <options>\n"
    "   Legacy memory resource pool operations\n"
    "Options:\n"
    "    -e              Check if group is empty\n"
    "    -g path         Specify group path\n"
    "    -i              Print group configuration and stats\n"
    "    -m memMB        Size memory for the group\n"
    "    -w time         Time in seconds to poll and wait for group to become empty\n";

}  // namespace Test
