// SPDX-License-Identifier: Apache-2.0
// Evaluates one expression, parsing its text each time, alternately by the language of the
// definitions and by muParser.
#include <muParser.h>

#include <chrono>
#include <cmath>
#include <cstdio>
#include <string>

#include "calc/evaluator.h"
#include "sample.h"

namespace {

constexpr int kRounds = 31;
constexpr int kEvaluationsInRound = 20000;
constexpr double kGoal = 15;

// Keeps the compiler from removing a loop whose result is not used.
volatile double sink;

template <typename Evaluation>
double nanosecondsEach(Evaluation evaluate) {
  const auto start = std::chrono::steady_clock::now();
  for (int i = 0; i < kEvaluationsInRound; ++i) {
    sink = evaluate();
  }
  const auto end = std::chrono::steady_clock::now();
  return std::chrono::duration<double, std::nano>(end - start).count() / kEvaluationsInRound;
}

}  // namespace

int main() {
  const std::string text = "min(physKB / 4096, 512) + numPCPUs * 2";
  const Calc::VariableTable variables = {{"numPCPUs", 8.0F},
                                         {"maxVMs", 1024.0F},
                                         {"isInstaller", 0.0F},
                                         {"isVm", 0.0F},
                                         {"physKB", 1048576.0F},
                                         {"nucdefs.nux86_debug", 0.0F},
                                         {"nucdefs.GCOV_NUCLEUS", 0.0F}};
  double cpus = 8;
  double physicalKB = 1048576;
  mu::Parser parser;
  parser.DefineVar("numPCPUs", &cpus);
  parser.DefineVar("physKB", &physicalKB);

  const auto ours = [&] { return static_cast<double>(Calc::Evaluate(text, variables)); };
  const auto theirs = [&] {
    parser.SetExpr(text);
    return parser.Eval();
  };
  if (std::abs(ours() - theirs()) > 1e-3) {
    std::fprintf(stderr, "the two results differ: %g and %g\n", ours(), theirs());
    return 1;
  }

  Bench::Sample oursNs, theirsNs, ratio;
  for (int round = 0; round < kRounds; ++round) {
    const double our = nanosecondsEach(ours);
    const double their = nanosecondsEach(theirs);
    oursNs.add(our);
    theirsNs.add(their);
    ratio.add(their / our);
  }
  std::printf("\n%s\n  read and evaluated, %d rounds of %d, ns: median (quartiles)\n", text.c_str(),
              kRounds, kEvaluationsInRound);
  std::printf("  poolctl %s, muParser %s\n", oursNs.text(0).c_str(), theirsNs.text(0).c_str());
  Bench::printGoal("times faster than muParser", ratio.median(), ratio.median() >= kGoal,
                   "at least 15");
  return 0;
}
