// SPDX-License-Identifier: Apache-2.0
// kestrel.conf: its defaults, its keys, and that nothing wrong in it is ignored.
#include "kestrel/configuration.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <array>

#include "store_test.h"

namespace Kestrel {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::StartsWith;

class ConfigurationFile : public StoreTest {
 protected:
  Configuration read(const std::string &text) const {
    configure(text);
    return readConfiguration();
  }

  // The refusal without the file's name in front: ":LINE: text".
  std::string refusal(const std::string &text) const {
    const std::string message = failureOf([&] { read(text); });
    EXPECT_THAT(message, StartsWith(file("kestrel.conf")));
    return message.substr(std::min(message.size(), file("kestrel.conf").size()));
  }
};

TEST_F(ConfigurationFile, EmptyMeansTheDefaults) {
  const Configuration read = this->read("# nothing\n\n");
  EXPECT_TRUE(read.fileExists);
  EXPECT_EQ(read.engine, Engine::kSqlite);
  EXPECT_THAT(read.prefixes, ElementsAre("/kestrel"));
  EXPECT_EQ(read.timeout.count(), 1000);
  EXPECT_EQ(read.runTimeout.count(), 3000);
  EXPECT_EQ(read.maxAge, std::chrono::hours(7 * 24));
  EXPECT_EQ(read.snapshot, "");
  EXPECT_EQ(read.lastRun, "");
  EXPECT_TRUE(read.endpoints.empty());
}

TEST_F(ConfigurationFile, EveryKeyIsRead) {
  const Configuration read = this->read(
      "store = etcd\n"
      "path = /x/store.db\n"
      "endpoints = https://a:2379 ,https://b,\thttps://[::1]:1\n"
      "prefix = /fleet/%L, /fleet/one\nlabel = rack.7\n"
      "cacert = /ca\ncert = /cert\nkey = /key\n"
      "user = reader\npassword-file = /secret\n"
      "timeout-ms = 250\nrun-timeout-ms = 400\nmax-age = 36h\n"
      "snapshot = /x/snapshot\nlast-run = /x/last\n");
  EXPECT_EQ(read.engine, Engine::kEtcd);
  EXPECT_EQ(read.path, "/x/store.db");
  EXPECT_THAT(read.endpoints, ElementsAre("https://a:2379", "https://b", "https://[::1]:1"));
  EXPECT_THAT(read.prefixes, ElementsAre("/fleet/rack.7", "/fleet/one"));
  EXPECT_EQ(read.cacert, "/ca");
  EXPECT_EQ(read.cert, "/cert");
  EXPECT_EQ(read.key, "/key");
  EXPECT_EQ(read.user, "reader");
  EXPECT_EQ(read.passwordFile, "/secret");
  EXPECT_EQ(read.timeout.count(), 250);
  EXPECT_EQ(read.runTimeout.count(), 400);
  EXPECT_EQ(read.maxAge, std::chrono::hours(36));
  EXPECT_EQ(read.snapshot, "/x/snapshot");
  EXPECT_EQ(read.lastRun, "/x/last");
}

TEST_F(ConfigurationFile, ItsRunTimeoutIsThreeTimeoutsUnlessGiven) {
  EXPECT_EQ(read("timeout-ms = 500\n").runTimeout.count(), 1500);
}

TEST_F(ConfigurationFile, ItsPrefixesNameHostAndLabel) {
  std::array<char, 256> host{};
  ASSERT_EQ(gethostname(host.data(), host.size() - 1), 0);
  EXPECT_THAT(read("prefix = /k/host/%H, /k/%L/x, /k%%\nlabel = canary\n").prefixes,
              ElementsAre("/k/host/" + std::string(host.data()), "/k/canary/x", "/k%"));
  configure("prefix = /k/host/%H, /k/%L\nlabel = canary\n");
  const HostNames other{"h2", "stable"};
  EXPECT_THAT(readConfiguration(&other).prefixes, ElementsAre("/k/host/h2", "/k/stable"));
  const HostNames unlabelled{"h2", ""};
  EXPECT_THAT(failureOf([&] { readConfiguration(&unlabelled); }), HasSubstr("%L needs \"label\""));
}

TEST_F(ConfigurationFile, APrefixThatCannotBeExpandedIsRefused) {
  EXPECT_THAT(refusal("prefix = /k/%L\n"), StartsWith(":1: prefix: %L needs \"label\""));
  EXPECT_THAT(refusal("prefix = /k/%x\n"), StartsWith(":1: prefix: bad value"));
  EXPECT_THAT(refusal("prefix = /k/%\n"), StartsWith(":1: prefix: bad value"));
  EXPECT_THAT(refusal("prefix = /k, /k\n"), StartsWith(":1: prefix: \"/k\" is given twice"));
  EXPECT_THAT(refusal("prefix = /k,\n"), StartsWith(":1: prefix: bad value"));
  EXPECT_THAT(refusal("label = a/b\n"), StartsWith(":1: label: bad value"));
  EXPECT_THAT(refusal("label = ..\n"), StartsWith(":1: label: bad value"));
}

TEST_F(ConfigurationFile, AnAgeHasAUnit) {
  EXPECT_EQ(read("max-age = 90s\n").maxAge, std::chrono::seconds(90));
  EXPECT_EQ(read("max-age = 30m\n").maxAge, std::chrono::minutes(30));
  EXPECT_EQ(read("max-age = 0d\n").maxAge, std::chrono::seconds(0));
  for (const char *age : {"7", "d", "-1d", "1w", "7 d", "99999d", "1.5h"}) {
    EXPECT_THAT(refusal(std::string("max-age = ") + age + "\n"),
                StartsWith(":1: max-age: bad value"));
  }
}

TEST_F(ConfigurationFile, APasswordIsNotSentInClear) {
  const std::string user = "user = u\npassword-file = /p\n";
  EXPECT_THAT(refusal(user + "endpoints = https://a, http://b\n"),
              StartsWith(":1: user: a password is sent only to https:// endpoints"));
  EXPECT_NO_THROW(read(user + "endpoints = https://a\n"));
}

TEST_F(ConfigurationFile, ThatEveryUserMayWriteIsRefused) {
  configure("path = /a\n");
  ASSERT_EQ(chmod(file("kestrel.conf").c_str(), 0666), 0);
  EXPECT_THAT(failureOf([] { readConfiguration(); }), HasSubstr("every user may write it"));
}

TEST_F(ConfigurationFile, WhatIsWrongIsNamedWithItsLine) {
  EXPECT_THAT(refusal("\nstore = redis\n"), StartsWith(":2: store: bad value \"redis\""));
  EXPECT_THAT(refusal("shop = sqlite\n"), StartsWith(":1: unknown key \"shop\""));
  EXPECT_THAT(refusal("store sqlite\n"), StartsWith(":1: no '='"));
  EXPECT_THAT(refusal("path = store.db\n"), StartsWith(":1: path: bad value"));
  EXPECT_THAT(refusal("path = /a\npath = /b\n"), StartsWith(":2: path: already given"));
  EXPECT_THAT(refusal("path =\n"), StartsWith(":1: path: no value"));
  EXPECT_THAT(refusal("prefix = kestrel\n"), StartsWith(":1: prefix: bad value"));
  EXPECT_THAT(refusal("prefix = /kestrel/\n"), StartsWith(":1: prefix: bad value"));
  for (const char *time : {"0", "-1", "3600001", "1s", "1.5", "99999999999999999999"}) {
    EXPECT_THAT(refusal(std::string("timeout-ms = ") + time + "\n"),
                StartsWith(":1: timeout-ms: bad value"));
  }
}

TEST_F(ConfigurationFile, AnEndpointIsAnHttpAddressAndNothingElse) {
  for (const char *list :
       {"localhost:2379", "ftp://a", "http://", "http://a/b", "http://a,,http://b", ",http://a",
        "http://a,", "http://user@a", "http://a b"}) {
    EXPECT_THAT(refusal(std::string("endpoints = ") + list + "\n"),
                StartsWith(":1: endpoints: bad value"))
        << list;
  }
}

TEST_F(ConfigurationFile, WhatNeedsAnotherKeyIsRefusedWithoutIt) {
  EXPECT_THAT(refusal("store = etcd\n"), HasSubstr("etcd needs \"endpoints\""));
  EXPECT_THAT(refusal("cert = /c\n"), HasSubstr("needs \"key\""));
  EXPECT_THAT(refusal("key = /k\n"), HasSubstr("needs \"cert\""));
  EXPECT_THAT(refusal("user = u\n"), HasSubstr("needs \"password-file\""));
  EXPECT_THAT(refusal("password-file = /p\n"), HasSubstr("needs \"user\""));
}

TEST_F(ConfigurationFile, ThatIsNamedButMissingIsAnError) {
  setenv("KESTREL_CONF", file("nowhere.conf").c_str(), 1);
  EXPECT_THAT(failureOf([] { readConfiguration(); }), StartsWith(file("nowhere.conf")));
}

TEST_F(ConfigurationFile, AnEmptyVariableNamesNoFile) {
  setenv("KESTREL_CONF", "", 1);
  EXPECT_EQ(configurationFile(), "/etc/kestrel.conf");
  unsetenv("KESTREL_CONF");
  EXPECT_EQ(configurationFile(), "/etc/kestrel.conf");
}

TEST_F(ConfigurationFile, ThatCannotBeReadIsAnError) {
  setenv("KESTREL_CONF", folder_.path().c_str(), 1);
  EXPECT_THAT(failureOf([] { readConfiguration(); }), StartsWith(folder_.path().string()));
}

// The default path depends on the user; a child process can become another one.
std::string defaultPathOfUser(uid_t user, const std::string &dataHome) {
  int ends[2];
  if (pipe(ends) != 0) return "pipe";
  const pid_t child = fork();
  if (child == 0) {
    if (dataHome.empty()) {
      unsetenv("XDG_DATA_HOME");
    } else {
      setenv("XDG_DATA_HOME", dataHome.c_str(), 1);
    }
    setenv("HOME", "/home/user", 1);
    std::string path = "no rights";
    if (user == geteuid() || setuid(user) == 0) path = readConfiguration().path;
    _exit(write(ends[1], path.data(), path.size()) < 0);
  }
  close(ends[1]);
  std::string path(4096, '\0');
  const ssize_t size = read(ends[0], path.data(), path.size());
  close(ends[0]);
  (void)waitpid(child, nullptr, 0);
  path.resize(static_cast<size_t>(std::max<ssize_t>(size, 0)));
  return path;
}

TEST_F(ConfigurationFile, TheDefaultStoreOfRootIsTheHosts) {
  if (geteuid() != 0) GTEST_SKIP() << "not root";
  configure("");
  EXPECT_EQ(readConfiguration().path, "/var/lib/kestrel/store.db");
}

TEST_F(ConfigurationFile, TheDefaultStoreOfOthersIsTheirOwn) {
  configure("");
  std::filesystem::permissions(folder_.path(), std::filesystem::perms(0755));
  const uid_t user = geteuid() == 0 ? 65534 : geteuid();
  EXPECT_EQ(defaultPathOfUser(user, "/data"), "/data/kestrel/store.db");
  EXPECT_EQ(defaultPathOfUser(user, ""), "/home/user/.local/share/kestrel/store.db");
  EXPECT_EQ(defaultPathOfUser(user, "not/absolute"), "/home/user/.local/share/kestrel/store.db");
}

}  // namespace
}  // namespace Kestrel
