// SPDX-License-Identifier: Apache-2.0
// The configuration store under load: what a run of 1,000 !config values costs on SQLite and on
// etcd, against a bare curl program that makes the same range request and one that reads key by
// key, and how long 200 hosts that start at once wait for a cluster. The sides of a comparison take
// turns within one run.
//
// usage: bench_etcd BIN_FOLDER BENCH_FOLDER WORK_FOLDER; scripts/run-bench calls it.
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <exception>
#include <filesystem>
#include <sstream>
#include <stdexcept>
#include <string>
#include <vector>

#include "child_process.h"
#include "etcd_server.h"
#include "sample.h"
#include "temp_folder.h"

namespace {

using Bench::runProgram;
using Bench::Sample;
using Test::writeFile;

constexpr int kValues = 1000;
constexpr int kRepetitions = 21;
constexpr int kStormHosts = 200;
constexpr int kStormValues = 50;
constexpr int kStorms = 5;
constexpr int kStormTimeoutMs = 10000;  // as docs/fleet.md recommends
constexpr double kSqliteGoalMs = 0.1;
constexpr double kEtcdGoal = 1.2;

struct Programs {
  std::string poolctl, install, kestrelctl, lookups, bareCurl;
};

// The store's content, as kestrelctl imports it. etcd takes 128 objects at once.
void fillStore(const Programs &programs, const std::string &folder, int from, int to) {
  std::string yaml;
  for (int i = from; i < to; ++i) {
    yaml += "- {component: host, group: pools, key: p" + std::to_string(i) +
            ", fields: {sizeMB: " + std::to_string(1000 + i) + ", percent: 12.5}}\n";
  }
  writeFile(folder + "/store.yaml", yaml);
  runProgram({programs.kestrelctl, "import", folder + "/store.yaml"});
}

void fillStore(const Programs &programs, const std::string &folder) {
  for (int from = 0; from < kValues; from += 100) {
    fillStore(programs, folder, from, std::min(from + 100, kValues));
  }
}

std::string definitions(const Programs &programs, const std::string &path, int values,
                        bool references) {
  std::string yaml;
  for (int i = 0; i < values; ++i) {
    const std::string name = "p" + std::to_string(i);
    yaml += "- name: " + name + "\n  memMax: " +
            (references ? "!config {object: [host, pools, " + name + "], key: sizeMB, default: 5}"
                        : std::to_string(1000 + i)) +
            "\n";
  }
  writeFile(path, yaml);
  runProgram({programs.install, "--mark", path});
  return path;
}

void useSqlite(const std::string &folder) {
  writeFile(folder + "/kestrel.conf", "store = sqlite\npath = " + folder + "/store.db\n");
}

void useEtcd(const std::string &file, const std::vector<std::string> &endpoints,
             int timeoutMs = 1000) {
  std::string list;
  for (const std::string &endpoint : endpoints) list += (list.empty() ? "" : ", ") + endpoint;
  writeFile(file, "store = etcd\nendpoints = " + list +
                      "\ntimeout-ms = " + std::to_string(timeoutMs) + "\nsnapshot = " + file +
                      ".snapshot\nlast-run = " + file + ".last\n");
}

double wallMs(const std::vector<std::string> &commandLine) {
  return runProgram(commandLine).wallMicroseconds / 1000;
}

// The CPU time of a process since its start, in ms.
double cpuMsOf(pid_t pid) {
  std::istringstream stat(Test::readFile("/proc/" + std::to_string(pid) + "/stat"));
  std::string field;
  double ticks = 0;
  for (int number = 1; number <= 15 && stat >> field; ++number) {
    if (number >= 14) ticks += std::stod(field);  // user and system time
  }
  return ticks * 1000 / static_cast<double>(sysconf(_SC_CLK_TCK));
}

struct Lookups {
  Sample program, poolctl;
};

// One run of the lookups alone, and one of poolctl less what it costs without references.
void measureOnce(const Programs &programs, const std::string &plain, const std::string &references,
                 Lookups *result) {
  result->program.add(wallMs({programs.lookups, std::to_string(kValues)}));
  const double with = wallMs({programs.poolctl, "list", references});
  result->poolctl.add(with - wallMs({programs.poolctl, "list", plain}));
}

// A folder of the measurement's own, whose kestrel.conf holds for the programs that it runs.
std::string enter(const std::string &folder) {
  std::filesystem::create_directory(folder);
  setenv("KESTREL_CONF", (folder + "/kestrel.conf").c_str(), 1);
  return folder;
}

void compareLookups(const Programs &programs, const std::string &folder) {
  const std::string plain = definitions(programs, folder + "/plain.yaml", kValues, false);
  const std::string references = definitions(programs, folder + "/config.yaml", kValues, true);
  Test::Etcd etcd(folder, 1);
  const std::string conf = folder + "/kestrel.conf";
  useSqlite(folder);
  fillStore(programs, folder);
  useEtcd(conf, etcd.urls());
  fillStore(programs, folder);

  Lookups sqlite, overEtcd;
  Sample range, singles, ratio, ourCpu, rangeCpu, serverCpu, serverSinglesCpu;
  const std::string url = etcd.urls()[0];
  const pid_t server = etcd.member(0).pid();
  for (int i = 0; i < kRepetitions; ++i) {
    useSqlite(folder);
    measureOnce(programs, plain, references, &sqlite);
    useEtcd(conf, etcd.urls());
    measureOnce(programs, plain, references, &overEtcd);
    const double before = cpuMsOf(server);
    const Bench::Cost our = runProgram({programs.lookups, std::to_string(kValues)});
    serverCpu.add(cpuMsOf(server) - before);
    const Bench::Cost their = runProgram({programs.bareCurl, url, "range"});
    const double beforeSingles = cpuMsOf(server);
    singles.add(runProgram({programs.bareCurl, url, std::to_string(kValues)}).wallMicroseconds /
                1000);
    serverSinglesCpu.add(cpuMsOf(server) - beforeSingles);
    range.add(their.wallMicroseconds / 1000);
    ratio.add(our.wallMicroseconds / their.wallMicroseconds);
    ourCpu.add(our.cpuMicroseconds / 1000);
    rangeCpu.add(their.cpuMicroseconds / 1000);
  }
  std::printf("\n%d !config values in one run, %d runs, ms a run\n", kValues, kRepetitions);
  std::printf("  SQLite: lookups alone %s, in poolctl list %s\n", sqlite.program.text(2).c_str(),
              sqlite.poolctl.text(2).c_str());
  std::printf("  etcd:   lookups alone %s, in poolctl list %s\n", overEtcd.program.text(2).c_str(),
              overEtcd.poolctl.text(2).c_str());
  std::printf("  bare curl: one range %s, %d single reads %s\n", range.text(2).c_str(), kValues,
              singles.text(2).c_str());
  std::printf("  of these on the CPU: lookups over etcd %s, bare range %s\n",
              ourCpu.text(2).c_str(), rangeCpu.text(2).c_str());
  std::printf("  the server's CPU: our run %s, single reads %s\n", serverCpu.text(1).c_str(),
              serverSinglesCpu.text(1).c_str());
  const double onSqlite = std::max(sqlite.program.median(), sqlite.poolctl.median()) / kValues;
  Bench::printGoal("SQLite, ms a value", onSqlite, onSqlite <= kSqliteGoalMs, "at most 0.1");
  Bench::printGoal("etcd, as a multiple of the bare range", ratio.median(),
                   ratio.median() <= kEtcdGoal, "at most 1.2");
}

// What every host prints when it got each of its values from the store.
std::string expectedList() {
  std::string text = "name,auto,memMin,memMax,memMinLimit,memShares,cpuMin,cpuMax,cpuShares\n";
  std::vector<std::string> rows;
  for (int i = 0; i < kStormValues; ++i) {
    rows.push_back("host/opt/p" + std::to_string(i) + ",yes,0," + std::to_string(1000 + i) +
                   ",-,-,0,-,1000\n");
  }
  std::sort(rows.begin(), rows.end(), [](const std::string &a, const std::string &b) {
    return a.substr(0, a.find(',')) < b.substr(0, b.find(','));
  });
  for (const std::string &row : rows) text += row;
  return text;
}

struct Host {
  pid_t pid = -1;
  std::string output;
};

Host startHost(const Programs &programs, const std::string &folder, const std::string &yaml,
               int index, const std::string &conf) {
  Host host;
  host.output = folder + "/host." + std::to_string(index);
  host.pid = fork();
  if (host.pid < 0) throw std::runtime_error("fork failed");
  if (host.pid == 0) {
    setenv("KESTREL_CONF", conf.c_str(), 1);
    if (std::freopen(host.output.c_str(), "w", stdout) == nullptr) _exit(126);
    execl(programs.poolctl.c_str(), programs.poolctl.c_str(), "list", "-v", yaml.c_str(),
          static_cast<char *>(nullptr));
    _exit(127);
  }
  return host;
}

// The number of hosts that did not get every value from the store.
int awaitHosts(const std::vector<Host> &hosts, const std::string &expected) {
  int failures = 0;
  for (const Host &host : hosts) {
    int status = 0;
    while (waitpid(host.pid, &status, 0) < 0) {
    }
    if (status != 0 || Test::readFile(host.output) != expected) ++failures;
  }
  return failures;
}

void storm(const Programs &programs, const std::string &folder) {
  Test::Etcd etcd(folder, 3);
  const std::vector<std::string> urls = etcd.urls();
  useEtcd(folder + "/kestrel.conf", urls);
  fillStore(programs, folder, 0, kStormValues);
  for (size_t i = 0; i < urls.size(); ++i) etcd.awaitReady(i);
  const std::string yaml = definitions(programs, folder + "/storm.yaml", kStormValues, true);
  const std::string expected = expectedList();
  std::vector<std::string> confs;
  for (size_t first = 0; first < urls.size(); ++first) {
    std::vector<std::string> order = urls;
    std::rotate(order.begin(), order.begin() + static_cast<std::ptrdiff_t>(first), order.end());
    confs.push_back(folder + "/kestrel." + std::to_string(first));
    useEtcd(confs.back(), order, kStormTimeoutMs);
  }

  Sample perSecond, seconds;
  int failures = 0;
  for (int run = 0; run < kStorms; ++run) {
    const auto start = std::chrono::steady_clock::now();
    std::vector<Host> hosts;
    for (int i = 0; i < kStormHosts; ++i) {
      const std::string &conf = confs[static_cast<size_t>(i) % confs.size()];
      hosts.push_back(startHost(programs, folder, yaml, i, conf));
    }
    failures += awaitHosts(hosts, expected);
    const auto time = std::chrono::steady_clock::now() - start;
    seconds.add(std::chrono::duration<double>(time).count());
    perSecond.add(kStormHosts / std::chrono::duration<double>(time).count());
  }
  std::printf("\nBoot storm: %d hosts at once, %d values each, a cluster of three, %d runs\n",
              kStormHosts, kStormValues, kStorms);
  std::printf("  s until the last host had its values: %s\n  hosts a second: %s\n",
              seconds.text(2).c_str(), perSecond.text(0).c_str());
  Bench::printGoal("hosts that did not get all their values", failures, failures == 0, "none");
}

}  // namespace

int main(int argc, char **argv) {
  if (argc != 4) {
    std::fprintf(stderr, "usage: bench_etcd BIN_FOLDER BENCH_FOLDER WORK_FOLDER\n");
    return 2;
  }
  const std::string bin = argv[1], bench = argv[2], folder = argv[3];
  std::setvbuf(stdout, nullptr, _IOLBF, 0);
  try {
    const Programs programs{bin + "/poolctl", bin + "/poolctl-install", bin + "/kestrelctl",
                            bench + "/store_lookups", bench + "/bare_curl"};
    compareLookups(programs, enter(folder + "/values"));
    storm(programs, enter(folder + "/storm"));
  } catch (const std::exception &failure) {
    std::fprintf(stderr, "bench_etcd: %s\n", failure.what());
    return 1;
  }
  return 0;
}
