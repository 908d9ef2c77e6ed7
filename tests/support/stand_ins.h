// SPDX-License-Identifier: Apache-2.0
// A world in which the program under test uses the stand-in libraries. A test writes their scripts
// and reads their traces; recording/README.md describes both.
#pragma once

#include <string>
#include <vector>

#include "world.h"

namespace Test {

class StandInWorld : public World {
 public:
  // libknob is the recording one; its groups are "host" and "host/opt".
  StandInWorld();

  // Adds a line to the script of the recording libknob.
  void knob(const std::string &line);

  // Replaces the real libkestrelconfig by the scripted one, and adds a line to its script.
  void config(const std::string &line);

  // Gives the program a clock that starts at that second and advances only when it sleeps, and
  // records what it logs.
  void hostCalls(const std::string &startSecond = "1000000000");

  // Runs poolctl with empty traces.
  ProcessResult poolctl(const Arguments &arguments, Streams streams = Streams::kApart);

  bool ranPoolctl() const;

  // The traces of the last run.
  std::vector<std::string> everyCall() const;    // except those for texts of statuses
  std::vector<std::string> kernelCalls() const;  // KNOB_Get, KNOB_Set, KNOB_GetInstanceListAlloc
  std::vector<std::string> groupCalls() const;   // the same, without those for facts of the machine
  std::vector<std::string> misuse() const;       // wrong use of lists, or a missing END
  std::vector<std::string> hostTrace() const;    // log and sleep, of the host calls
  std::vector<std::string> flushes() const;      // of standard output
  std::vector<std::string> configTrace() const;
  std::string groups() const;  // at the end of the program, one on each line
  bool wasInjected() const;    // whether a rule made a call fail

 private:
  void addLine(const char *variable, const std::string &line);
};

}  // namespace Test
