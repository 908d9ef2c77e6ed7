// SPDX-License-Identifier: Apache-2.0
// The built programs on a fleet's store: poolctl reads its values, kestrelctl writes them, and a
// host on SQLite loads nothing of it.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <thread>

#include "certificates.h"
#include "etcd_world.h"
#include "fake_server.h"
#include "world.h"

namespace Test {
namespace {

using std::chrono::milliseconds;
using testing::AllOf;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;

constexpr const char *kHeader =
    "name,auto,memMin,memMax,memMinLimit,memShares,cpuMin,cpuMax,cpuShares\n";

std::string reference(const std::string &key, const std::string &field, const std::string &other) {
  return "!config {object: [host, pools, " + key + "], key: " + field + ", default: " + other + "}";
}

std::string poolsWithReferences(int count) {
  std::string yaml;
  for (int i = 0; i < count; ++i) {
    yaml += "- {name: p" + std::to_string(i) +
            ", memMax: " + reference("p" + std::to_string(i), "sizeMB", "5") + "}\n";
  }
  return yaml;
}

class EtcdPrograms : public testing::Test {
 protected:
  // A sanitizer loads modules in the name of its own library, which has no path to ours.
  EtcdPrograms() {
    const std::string folder = SANITIZED_LIBRARIES;
    if (!folder.empty()) world_.environment["LD_LIBRARY_PATH"] = folder;
  }

  void serve(int members = 1, const std::string &timeout = "20000") {
    etcd_ = std::make_unique<Etcd>(world_.folder(), members);
    std::string list;
    for (const std::string &url : etcd_->urls()) list += (list.empty() ? "" : ", ") + url;
    configure("store = etcd\nendpoints = " + list + "\ntimeout-ms = " + timeout + "\n");
  }
  // What the library writes about a run stays in the test's folder.
  void configure(const std::string &text) const {
    writeFile(world_.folder() / "kestrel.conf",
              text + "snapshot = " + (world_.folder() / "snapshot").string() +
                  "\nlast-run = " + (world_.folder() / "last").string() + "\n");
  }
  void put(const std::string &key, const std::string &value) const {
    etcd_->etcdctl({"put", "/kestrel/global/" + key}, value);
  }

  std::string kestrelctl(const Arguments &arguments, int status = 0) const {
    const ProcessResult result = world_.run("kestrelctl", arguments);
    EXPECT_EQ(result.status, status) << result.out << result.err;
    return result.out + result.err;
  }
  std::string list(const std::string &yaml) {
    const ProcessResult result =
        world_.poolctl({"list", "-v", world_.file("pools.yaml", yaml).string()});
    EXPECT_EQ(result.status, 0) << result.err;
    EXPECT_EQ(result.err, "");
    EXPECT_THAT(result.out, StartsWith(kHeader));
    return result.out.substr(std::min(result.out.size(), std::string(kHeader).size()));
  }
  std::string lastRun() const { return readFile(world_.folder() / "last"); }
  // What store_probe looked up, what it has mapped, and what it logged.
  std::string probe(const std::string &key, const std::string &field) const {
    return world_.run(STORE_PROBE, {"host", "pools", key, field}).out;
  }
  // Every library that poolctl loads, as the dynamic linker prints it.
  std::string librariesOfList(const std::string &yaml) {
    world_.environment["LD_DEBUG"] = "files";
    return world_.poolctl({"list", world_.file("pools.yaml", yaml).string()}).err;
  }

  World world_;
  std::unique_ptr<Etcd> etcd_;
};

TEST_F(EtcdPrograms, APoolTakesItsValuesFromTheFleetsStore) {
  serve();
  put("host/pools/backup", R"({"sizeMB": 2048, "percent": 12.75, "on": 0})");
  EXPECT_EQ(list("- {name: backup, memMax: " + reference("backup", "sizeMB", "5") +
                 ", cpuMax: " + reference("backup", "percent", "5") +
                 ", isEnabled: " + reference("backup", "on", "true") + "}\n"),
            "host/opt/backup,no,0,2048,-,-,0,12,1000\n");
}

TEST_F(EtcdPrograms, WhereTheStoreHasNoNumberTheDefaultIsUsed) {
  serve();
  put("host/pools/a", R"({"text": "7", "truth": true})");
  put("host/pools/bad", R"({"sizeMB": 7, "nested": {}})");
  put("host/pools/garbage", "sizeMB=7");
  for (const auto &[key, field] :
       {std::pair("a", "text"), std::pair("a", "truth"), std::pair("a", "none"),
        std::pair("none", "sizeMB"), std::pair("bad", "sizeMB"), std::pair("garbage", "sizeMB")}) {
    EXPECT_EQ(list("- {name: a, memMax: " + reference(key, field, "5") + "}\n"),
              "host/opt/a,yes,0,5,-,-,0,-,1000\n")
        << key << " " << field;
  }
}

TEST_F(EtcdPrograms, ARunWithoutAResponseWaitsOnceAndUsesItsDefaults) {
  serve(1, "900");
  put("host/pools/p1", R"({"sizeMB": 7})");
  etcd_->member(0).stop();
  std::string out;
  const auto time = timeOf([&] { out = list(poolsWithReferences(50)); });
  EXPECT_THAT(out, HasSubstr("host/opt/p1,yes,0,5,"));
  EXPECT_GE(time, milliseconds(850));
  EXPECT_LT(time, milliseconds(1700));
  EXPECT_THAT(lastRun(), AllOf(HasSubstr("source = none\nvalues = 0\ndefaults = 0\nfailures = 50"),
                               HasSubstr("error = etcd: ")));
}

TEST_F(EtcdPrograms, ARunWithoutMembersUsesItsDefaults) {
  serve();
  etcd_->member(0).kill();
  EXPECT_THAT(list(poolsWithReferences(50)), HasSubstr("host/opt/p49,yes,0,5,"));
}

TEST_F(EtcdPrograms, ARunWithoutAQuorumReadsItsValues) {
  serve(3, "4000");
  for (int i = 0; i < 3; ++i) put("host/pools/p" + std::to_string(i), R"({"sizeMB": 7})");
  etcd_->awaitReady(2);
  etcd_->member(0).kill();
  etcd_->member(1).kill();
  EXPECT_THAT(list(poolsWithReferences(3)),
              AllOf(HasSubstr("p0,yes,0,7,"), HasSubstr("p1,yes,0,7,"), HasSubstr("p2,yes,0,7,")));
  EXPECT_THAT(lastRun(), HasSubstr("source = etcd without a quorum\n"));
}

TEST_F(EtcdPrograms, AnOutageUsesTheLastKnownGoodValues) {
  serve();
  put("host/pools/p1", R"({"sizeMB": 7})");
  EXPECT_THAT(list(poolsWithReferences(2)), HasSubstr("p1,yes,0,7,"));
  EXPECT_THAT(lastRun(), AllOf(HasSubstr("program = poolctl\nsource = etcd\n"),
                               HasSubstr("\nvalues = 1\ndefaults = 1\nfailures = 0\n"),
                               Not(HasSubstr("problem"))));
  etcd_->member(0).kill();
  EXPECT_THAT(list(poolsWithReferences(2)), HasSubstr("p1,yes,0,7,"));
  EXPECT_THAT(lastRun(), AllOf(HasSubstr("source = last known good\n"),
                               HasSubstr("problem = etcd: "), HasSubstr("Failed to connect")));
  EXPECT_THAT(kestrelctl({"status"}, 1), HasSubstr("last run       source = last known good\n"));
}

TEST_F(EtcdPrograms, TheSystemLogGetsOneLineForARunOnOldValuesOrFailures) {
  serve();
  put("host/pools/a", R"({"sizeMB": 7})");
  EXPECT_THAT(probe("a", "sizeMB"), Not(HasSubstr("kestrel: ")));
  etcd_->member(0).kill();
  EXPECT_THAT(probe("a", "sizeMB"),
              AllOf(StartsWith("integer 7\n"),
                    HasSubstr("log: kestrel: 1 values from last known good (revision 2, ")));
  std::filesystem::remove(world_.folder() / "snapshot");
  EXPECT_THAT(probe("a", "sizeMB"),
              AllOf(StartsWith("ConfigStoreException"),
                    HasSubstr("log: kestrel: 0 values from none, 0 defaults, 1 failed lookups: "),
                    HasSubstr("last known good values: No such file")));
}

TEST_F(EtcdPrograms, AHostOnSqliteMapsNeitherTheModuleNorItsLibrary) {
  kestrelctl({"set", "host", "pools", "a", "sizeMB", "7"});
  const std::string maps = probe("a", "sizeMB");
  EXPECT_THAT(maps, StartsWith("integer 7\n"));
  EXPECT_THAT(maps, HasSubstr("/libkestrelconfig.so"));
  EXPECT_THAT(maps, Not(HasSubstr("kestrel-etcd")));
  EXPECT_THAT(maps, Not(HasSubstr("libcurl")));
  EXPECT_THAT(maps, Not(HasSubstr("libssl")));
}

TEST_F(EtcdPrograms, AHostOfAFleetMapsTheModule) {
  serve();
  put("host/pools/a", R"({"sizeMB": 7})");
  const std::string maps = probe("a", "sizeMB");
  EXPECT_THAT(maps, StartsWith("integer 7\n"));
  EXPECT_THAT(maps, HasSubstr("/libkestrel-etcd.so"));
  EXPECT_THAT(maps, HasSubstr("/libcurl"));
}

TEST_F(EtcdPrograms, PoolctlOnSqliteDoesNotLoadTheModule) {
  kestrelctl({"set", "host", "pools", "p0", "sizeMB", "7"});
  const std::string libraries = librariesOfList(poolsWithReferences(1));
  EXPECT_THAT(libraries, HasSubstr("libkestrelconfig"));
  EXPECT_THAT(libraries, Not(HasSubstr("kestrel-etcd")));
  EXPECT_THAT(libraries, Not(HasSubstr("libcurl")));
}

TEST_F(EtcdPrograms, ARunWithoutAReferenceOpensNoStore) {
  const FakeServer server([](const FakeRequest &) { return std::string(); });
  configure("store = etcd\nendpoints = " + server.url() + "\n");
  EXPECT_THAT(librariesOfList("- {name: a, memMax: 7}\n"), Not(HasSubstr("kestrel-etcd")));
  EXPECT_EQ(server.connections(), 0);
  EXPECT_THAT(librariesOfList(poolsWithReferences(1)), HasSubstr("kestrel-etcd"));
  EXPECT_EQ(server.connections(), 1);
}

TEST_F(EtcdPrograms, SeveralThreadsReadTheStore) {
  serve();
  put("host/pools/a", R"({"sizeMB": 7})");
  EXPECT_EQ(world_.run(STORE_PROBE, {"host", "pools", "a", "sizeMB", "8"}).out, "400\n");
}

TEST_F(EtcdPrograms, ExceptionsOfTheModuleAreThoseOfTheLibrary) {
  serve();
  put("host/pools/a", R"({"text": "x"})");
  put("host/pools/bad", "garbage");
  EXPECT_THAT(probe("a", "text"), StartsWith("InvalidTypeException: "));
  EXPECT_THAT(probe("bad", "text"),
              StartsWith("ConfigStoreException: etcd: /kestrel/global/host/pools/bad: the value"));
  etcd_->member(0).kill();
  std::filesystem::remove(world_.folder() / "snapshot");
  EXPECT_THAT(probe("a", "text"), StartsWith("ConfigStoreException: etcd: "));
}

TEST_F(EtcdPrograms, WithoutTheModuleTheLibrarySaysSo) {
  const auto folder = world_.folder() / "lib";
  std::filesystem::create_directory(folder);
  std::filesystem::copy_file(KESTRELCONFIG, folder / "libkestrelconfig.so.1");
  world_.environment["LD_LIBRARY_PATH"] = folder;
  configure("store = etcd\nendpoints = http://127.0.0.1:1\n");
  EXPECT_THAT(probe("a", "text"), AllOf(StartsWith("ConfigStoreException: "),
                                        HasSubstr("this build has no etcd module")));
}

TEST_F(EtcdPrograms, ProcessesThatWriteAtTheSameTimeLoseNothing) {
  serve();
  constexpr int kWriters = 6;
  constexpr int kFields = 8;
  std::vector<std::thread> writers;
  for (int writer = 0; writer < kWriters; ++writer) {
    writers.emplace_back([&, writer] {
      for (int field = 0; field < kFields; ++field) {
        const std::string name = "w" + std::to_string(writer) + "." + std::to_string(field);
        kestrelctl({"set", "host", "pools", "shared", name, std::to_string(field)});
      }
    });
  }
  for (std::thread &writer : writers) writer.join();
  EXPECT_EQ(lines(kestrelctl({"get", "host", "pools", "shared"})).size(), kWriters * kFields);
}

TEST_F(EtcdPrograms, KestrelctlSetsShowsAndDeletes) {
  serve();
  kestrelctl({"set", "host", "a/b %", "", "n", "7"});
  kestrelctl({"set", "host", "a/b %", "", "r", "7.0"});
  kestrelctl({"set", "host", "a/b %", "", "t", "7", "--type", "text"});
  kestrelctl({"set", "host", "a/b %", "", "t", "true", "--extra", "\xc3\xa9"});
  EXPECT_EQ(kestrelctl({"get", "host", "a/b %", ""}), "n\tinteger\t7\nr\treal\t7.0\nt\ttext\t7\n");
  EXPECT_EQ(kestrelctl({"get", "host", "a/b %", "", "r"}), "7.0\n");
  EXPECT_EQ(lines(kestrelctl({"list"})).size(), 4U);
  kestrelctl({"delete", "host", "a/b %", "", "n"});
  kestrelctl({"delete", "host", "a/b %", "", "--extra", "\xc3\xa9"});
  EXPECT_EQ(lines(kestrelctl({"list", "host", "a/b %"})).size(), 2U);
  EXPECT_NE(kestrelctl({"set", "host", "a", "b", "x", "inf", "--type", "real"}, 1).find("inf"),
            std::string::npos);
}

TEST_F(EtcdPrograms, AHostsOwnStoreIsCopiedToTheFleetsAndBack) {
  kestrelctl({"set", "host", "pools", "a", "sizeMB", "7"});
  kestrelctl({"set", "host", "p/q", "", "note", "text \"\xc3\xa9\"\n", "--extra", "e"});
  kestrelctl({"set", "host", "pools", "b", "half", "0.5"});
  const std::string yaml = kestrelctl({"export"});
  serve();
  world_.input = yaml;
  kestrelctl({"import", "-"});
  EXPECT_EQ(kestrelctl({"export"}), yaml);
}

TEST_F(EtcdPrograms, AnImportBeyondTheServersLimitChangesNothing) {
  serve();
  std::string yaml;
  for (int i = 0; i < 129; ++i) {
    yaml += "- {component: c, group: g, key: k" + std::to_string(i) + ", fields: {n: 1}}\n";
  }
  world_.input = yaml;
  EXPECT_THAT(kestrelctl({"import", "-"}, 1),
              AllOf(HasSubstr("too many operations"), HasSubstr("--max-txn-ops")));
  EXPECT_EQ(kestrelctl({"list"}), "");
}

TEST_F(EtcdPrograms, ARolloutGoesFromOneHostToAGroupToAll) {
  serve();
  configure("store = etcd\nendpoints = " + etcd_->urls()[0] +
            "\ntimeout-ms = 20000\nlabel = stable\n"
            "prefix = /kestrel/host/%H, /kestrel/canary/%L, /kestrel\n");
  const Arguments object = {"host", "pools", "backup"};
  const auto with = [&](const std::string &command, const Arguments &more) {
    Arguments arguments = {command};
    arguments.insert(arguments.end(), object.begin(), object.end());
    arguments.insert(arguments.end(), more.begin(), more.end());
    return arguments;
  };
  const Arguments canary = {"sizeMB", "--as", "web17", "--label", "canary"};
  kestrelctl(with("set", {"sizeMB", "1", "--layer", "/kestrel"}));
  kestrelctl(with("set", {"sizeMB", "2", "--layer", "/kestrel/host/web17"}));
  EXPECT_EQ(kestrelctl(with("resolve", canary)), "sizeMB\tinteger\t2\t/kestrel/host/web17\n");
  EXPECT_EQ(kestrelctl(with("get", {"--origin"})), "sizeMB\tinteger\t1\t/kestrel\n");
  kestrelctl(with("move", {"--from", "/kestrel/host/web17", "--to", "/kestrel/canary/canary"}));
  EXPECT_EQ(kestrelctl(with("resolve", canary)), "sizeMB\tinteger\t2\t/kestrel/canary/canary\n");
  EXPECT_EQ(kestrelctl(with("get", {"sizeMB"})), "1\n");
  kestrelctl(with("move", {"--from", "/kestrel/canary/canary", "--to", "/kestrel"}));
  EXPECT_EQ(kestrelctl(with("get", {"sizeMB"})), "2\n");
  EXPECT_THAT(kestrelctl(with("move", {"--from", "/kestrel/none", "--to", "/kestrel"}), 3),
              HasSubstr("no such object"));
  EXPECT_THAT(kestrelctl(with("set", {"sizeMB", "3"}), 1), HasSubstr("must be chosen"));
  EXPECT_THAT(kestrelctl(with("set", {"sizeMB", "3", "--layer", "x"}), 2), HasSubstr("--layer"));
  EXPECT_THAT(kestrelctl(with("resolve", {"--as", "web17"}), 1), HasSubstr("%L needs"));
}

TEST_F(EtcdPrograms, CheckAndKeepGoingShowWhatIsDamagedAndWhatIsNot) {
  serve();
  put("host/pools/a", R"({"n": 1})");
  put("host/pools/b", "garbage");
  put("c/g", "{}");
  EXPECT_EQ(kestrelctl({"check"}, 1),
            "/kestrel/global/c/g: the key is not that of an object\n"
            "/kestrel/global/host/pools/b: the value is not JSON: unreadable at byte 1\n");
  EXPECT_THAT(kestrelctl({"list"}, 1), HasSubstr("/kestrel/global/c/g: the key is not that of an "
                                                 "object (2 damaged in all: see kestrelctl check"));
  EXPECT_THAT(kestrelctl({"list", "--keep-going"}, 1),
              AllOf(StartsWith("host\tpools\ta\t\tn\tinteger\t1\n"), HasSubstr("are left out")));
  EXPECT_THAT(kestrelctl({"export", "--keep-going"}, 1), HasSubstr("key: a\n"));
  EXPECT_THAT(kestrelctl({"export"}, 1), Not(HasSubstr("key: a\n")));
}

TEST_F(EtcdPrograms, KestrelctlReportsWhyNoMemberResponds) {
  configure("store = etcd\nendpoints = http://" + freePlace() + "\n");
  for (const Arguments &arguments : {Arguments{"get", "a", "b", "c"},
                                     Arguments{"set", "a", "b", "c", "d", "1"},
                                     {"list"},
                                     Arguments{"delete", "a", "b", "c"},
                                     {"export"}}) {
    EXPECT_THAT(kestrelctl(arguments, 1), HasSubstr("no member responds")) << arguments[0];
  }
}

TEST_F(EtcdPrograms, StatusReportsEachMemberAndWhetherTheStoreIsUsable) {
  serve(1, "500");
  const std::string url = etcd_->urls()[0];
  EXPECT_THAT(kestrelctl({"status"}),
              AllOf(HasSubstr("etcd"), HasSubstr(url + ": etcd 3."), HasSubstr("responds in"),
                    HasSubstr("/kestrel"), HasSubstr("usable")));
  etcd_->member(0).stop();
  EXPECT_THAT(kestrelctl({"status"}, 1),
              HasSubstr(url + ": does not respond: Operation timed out"));
  etcd_->member(0).kill();
  EXPECT_THAT(kestrelctl({"status"}, 1), HasSubstr(url + ": does not respond: Failed to connect"));
}

TEST_F(EtcdPrograms, EveryKeyIsUsedAndThePasswordIsNeverShown) {
  const Authority authority(world_.folder(), "own");
  const Certificate server = authority.issue("server", ownAddress());
  const Certificate client = authority.issue("client", "127.0.0.1");
  EtcdOptions options;
  options.alsoAt = "https://" + freePlace();
  options.arguments = {"--cert-file=" + server.cert, "--key-file=" + server.key,
                       "--client-cert-auth", "--trusted-ca-file=" + authority.cert()};
  etcd_ = std::make_unique<Etcd>(world_.folder(), 1, options);
  etcd_->etcdctl({"put", "/elsewhere/global/host/pools/a"}, R"({"sizeMB": 7})");
  etcd_->etcdctl({"user", "add", "root:hunter22"});
  etcd_->etcdctl({"user", "grant-role", "root", "root"});
  etcd_->etcdctl({"auth", "enable"});
  const auto password = world_.folder() / "password";
  writeFile(password, "hunter22\n");
  chmod(password.c_str(), 0600);
  configure("store = etcd\nendpoints = " + options.alsoAt + "\nprefix = /elsewhere\ncacert = " +
            authority.cert() + "\ncert = " + client.cert + "\nkey = " + client.key +
            "\nuser = root\npassword-file = " + password.string() + "\ntimeout-ms = 20000\n");
  EXPECT_EQ(kestrelctl({"get", "host", "pools", "a", "sizeMB"}), "7\n");
  EXPECT_THAT(kestrelctl({"status"}), Not(HasSubstr("hunter22")));
  writeFile(password, "hunter33\n");
  EXPECT_THAT(kestrelctl({"status"}, 1),
              AllOf(HasSubstr("authentication failed"), Not(HasSubstr("hunter"))));
}

}  // namespace
}  // namespace Test
