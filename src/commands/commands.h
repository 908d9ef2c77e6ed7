// SPDX-License-Identifier: Apache-2.0
// The sub-commands and the option mode. Each parses its own options with getopt and returns the
// exit status of the process. They throw exceptions of the standard family, which the entry point
// reports with status 1.
#pragma once

// argv[0] is the sub-command's name. 0: success, 1: failure or usage error.
using CommandHandler = int (*)(int argc, char **argv);

int cmdList(int argc, char **argv);
int cmdLoad(int argc, char **argv);
int cmdUnload(int argc, char **argv);
int cmdEnable(int argc, char **argv);
int cmdDisable(int argc, char **argv);

// The option mode, on one group given by its path; argv[0] is the program. 0: success or an empty
// group, 1: bad option, 2: not empty, 3: wait timed out, 4: a kernel call failed.
int legacyMain(int argc, char **argv);
