// SPDX-License-Identifier: Apache-2.0
// A world in which the program under test meets the stand-in libraries: what they answer, and what
// they saw. The script lines and the traces are described in recording/README.md.
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

  // Puts the scripted libkestrelconfig in the place of the real one, and adds a line to its script.
  void config(const std::string &line);

  // Gives the program a clock that stands still at that second but for what it sleeps, and keeps
  // what it logs.
  void hostCalls(const std::string &startSecond = "1000000000");

  // Runs poolctl with empty traces.
  ProcessResult poolctl(const Arguments &arguments, Streams streams = Streams::kApart);

  bool ranPoolctl() const;

  // What the last run left.
  std::vector<std::string> everyCall() const;    // but those for texts of statuses
  std::vector<std::string> kernelCalls() const;  // KNOB_Get, KNOB_Set, KNOB_GetInstanceListAlloc
  std::vector<std::string> groupCalls() const;   // the same without the facts of the machine
  std::vector<std::string> misuse() const;       // faults in the use of lists, or a missing end
  std::vector<std::string> hostTrace() const;    // log and sleep, of the host calls
  std::vector<std::string> flushes() const;      // of standard output
  std::vector<std::string> configTrace() const;
  std::string groups() const;  // as they are at the end, one a line
  bool wasInjected() const;    // a rule made a call fail

 private:
  void addLine(const char *variable, const std::string &line);
};

}  // namespace Test
