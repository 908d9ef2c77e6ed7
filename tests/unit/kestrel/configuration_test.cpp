// SPDX-License-Identifier: Apache-2.0
// kestrel.conf: its defaults, its keys, and that nothing wrong in it is passed over.
#include "kestrel/configuration.h"

#include <gmock/gmock.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>

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
  EXPECT_EQ(read.prefix, "/kestrel");
  EXPECT_EQ(read.timeout.count(), 1000);
  EXPECT_TRUE(read.endpoints.empty());
}

TEST_F(ConfigurationFile, EveryKeyIsRead) {
  const Configuration read = this->read(
      "store = etcd\n"
      "path = /x/store.db\n"
      "endpoints = https://a:2379 ,http://b,\thttps://[::1]:1\n"
      "prefix = /fleet/one\n"
      "cacert = /ca\ncert = /cert\nkey = /key\n"
      "user = reader\npassword-file = /secret\n"
      "timeout-ms = 250\n");
  EXPECT_EQ(read.engine, Engine::kEtcd);
  EXPECT_EQ(read.path, "/x/store.db");
  EXPECT_THAT(read.endpoints, ElementsAre("https://a:2379", "http://b", "https://[::1]:1"));
  EXPECT_EQ(read.prefix, "/fleet/one");
  EXPECT_EQ(read.cacert, "/ca");
  EXPECT_EQ(read.cert, "/cert");
  EXPECT_EQ(read.key, "/key");
  EXPECT_EQ(read.user, "reader");
  EXPECT_EQ(read.passwordFile, "/secret");
  EXPECT_EQ(read.timeout.count(), 250);
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

// The default place depends on who asks; a child can become somebody else.
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
    setenv("HOME", "/home/somebody", 1);
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
  EXPECT_EQ(defaultPathOfUser(user, ""), "/home/somebody/.local/share/kestrel/store.db");
  EXPECT_EQ(defaultPathOfUser(user, "not/absolute"),
            "/home/somebody/.local/share/kestrel/store.db");
}

TEST_F(ConfigurationFile, IsComparedByAllItsKeys) {
  const Configuration one = read("path = /a\n");
  EXPECT_TRUE(one == read("path = /a\n"));
  EXPECT_FALSE(one == read("path = /b\n"));
  EXPECT_FALSE(one == read("path = /a\ntimeout-ms = 7\n"));
}

}  // namespace
}  // namespace Kestrel
