// SPDX-License-Identifier: Apache-2.0
#include "stand_ins.h"

#include <fstream>

namespace Test {

namespace fs = std::filesystem;

namespace {

bool beginsWith(const std::string &text, std::string_view begin) {
  return text.compare(0, begin.size(), begin) == 0;
}

void putFirst(std::string *list, const fs::path &folder) {
  *list = folder.string() + (list->empty() ? "" : ":" + *list);
}

}  // namespace

StandInWorld::StandInWorld() {
  putFirst(&environment["LD_LIBRARY_PATH"], standInFolder("knob"));
  const std::string own = folder().string();
  environment["RECORDING_KNOB_TRACE"] = own + "/knob.trace";
  environment["RECORDING_KNOB_SCRIPT"] = own + "/knob.script";
  environment["RECORDING_KNOB_GROUPS"] = own + "/knob.groups";
  environment["HOST_CALLS_TRACE"] = own + "/host.trace";
  environment["SCRIPTED_CONFIG_TRACE"] = own + "/config.trace";
  environment["SCRIPTED_CONFIG_SCRIPT"] = own + "/config.script";
}

void StandInWorld::addLine(const char *variable, const std::string &line) {
  std::ofstream(environment.at(variable), std::ios::app) << line << '\n';
}

void StandInWorld::knob(const std::string &line) {
  addLine("RECORDING_KNOB_SCRIPT", line);
}

void StandInWorld::config(const std::string &line) {
  if (!fs::exists(environment.at("SCRIPTED_CONFIG_SCRIPT")))
    putFirst(&environment["LD_LIBRARY_PATH"], standInFolder("config"));
  addLine("SCRIPTED_CONFIG_SCRIPT", line);
}

void StandInWorld::hostCalls(const std::string &startSecond) {
  environment["LD_PRELOAD"] = (standInFolder("host") / "libhost_calls.so").string();
  environment["HOST_CALLS_TIME"] = startSecond;
}

ProcessResult StandInWorld::poolctl(const Arguments &arguments, Streams streams) {
  for (const char *variable : {"RECORDING_KNOB_TRACE", "RECORDING_KNOB_GROUPS", "HOST_CALLS_TRACE",
                               "SCRIPTED_CONFIG_TRACE"})
    fs::remove(environment.at(variable));
  return World::poolctl(arguments, streams);
}

bool StandInWorld::ranPoolctl() const {
  return fs::exists(environment.at("RECORDING_KNOB_TRACE"));
}

std::vector<std::string> StandInWorld::everyCall() const {
  std::vector<std::string> result;
  for (const std::string &line : lines(readFile(environment.at("RECORDING_KNOB_TRACE"))))
    if (!beginsWith(line, "NUC_ReturnStatusToString") && line != "END") result.push_back(line);
  return result;
}

std::vector<std::string> StandInWorld::kernelCalls() const {
  std::vector<std::string> result;
  for (const std::string &line : everyCall())
    if (beginsWith(line, "KNOB_Get") || beginsWith(line, "KNOB_Set")) result.push_back(line);
  return result;
}

std::vector<std::string> StandInWorld::groupCalls() const {
  std::vector<std::string> result;
  for (const std::string &line : kernelCalls())
    if (line.find(" sched_") != std::string::npos) result.push_back(line);
  return result;
}

std::vector<std::string> StandInWorld::misuse() const {
  std::vector<std::string> result;
  const std::string trace = readFile(environment.at("RECORDING_KNOB_TRACE"));
  for (const std::string &line : lines(trace))
    if (beginsWith(line, "MISUSE")) result.push_back(line);
  if (lines(trace).empty() || lines(trace).back() != "END")
    result.push_back("the program did not end in order");
  return result;
}

std::vector<std::string> StandInWorld::hostTrace() const {
  std::vector<std::string> result;
  for (const std::string &line : lines(readFile(environment.at("HOST_CALLS_TRACE"))))
    if (!beginsWith(line, "flush ")) result.push_back(line);
  return result;
}

std::vector<std::string> StandInWorld::flushes() const {
  std::vector<std::string> result;
  for (const std::string &line : lines(readFile(environment.at("HOST_CALLS_TRACE"))))
    if (beginsWith(line, "flush ")) result.push_back(line);
  return result;
}

std::vector<std::string> StandInWorld::configTrace() const {
  return lines(readFile(environment.at("SCRIPTED_CONFIG_TRACE")));
}

std::string StandInWorld::groups() const {
  return readFile(environment.at("RECORDING_KNOB_GROUPS"));
}

bool StandInWorld::wasInjected() const {
  return readFile(environment.at("RECORDING_KNOB_TRACE")).find("(injected)") != std::string::npos;
}

}  // namespace Test
