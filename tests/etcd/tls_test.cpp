// SPDX-License-Identifier: Apache-2.0
// TLS on a real server, with certificates that the test makes.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cstdlib>

#include "certificates.h"
#include "etcd_world.h"

namespace Test {
namespace {

using Kestrel::Fields;
using testing::HasSubstr;

// The server has a plain address, too, by which the test itself reaches it.
class EtcdTls : public testing::Test {
 protected:
  void serve(const Certificate &server, std::vector<std::string> more = {}) {
    EtcdOptions options;
    options.alsoAt = url_;
    options.arguments = {"--cert-file=" + server.cert, "--key-file=" + server.key};
    options.arguments.insert(options.arguments.end(), more.begin(), more.end());
    etcd_ = std::make_unique<Etcd>(folder_.path(), 1, options);
    etcd_->etcdctl({"put", "/kestrel/global/c/g/a"}, R"({"n":1})");
  }
  void serveKnownClients() {
    serve(authority_.issue("server", ownAddress()),
          {"--client-cert-auth", "--trusted-ca-file=" + authority_.cert()});
  }

  Kestrel::Configuration configuration() const {
    Kestrel::Configuration result = etcd_->configuration();
    result.endpoints = {url_};
    result.cacert = authority_.cert();
    return result;
  }
  Kestrel::Configuration configurationOf(const Certificate &client) const {
    Kestrel::Configuration result = configuration();
    result.cert = client.cert;
    result.key = client.key;
    return result;
  }

  static std::string refusal(const Kestrel::Configuration &configuration) {
    return refusalOf([&] {
      const auto run = Kestrel::Etcd::openEtcdBackend(configuration);
      EXPECT_EQ(run->read(object("c", "g", "a")), (Fields{{"n", int64_t{1}}}));
    });
  }

  TempFolder folder_;
  const std::string url_ = "https://" + freePlace();
  Authority authority_{folder_.path(), "own"};
  Authority stranger_{folder_.path(), "strange"};
  std::unique_ptr<Etcd> etcd_;
};

TEST_F(EtcdTls, AServerOfTheNamedAuthorityIsReadAndWritten) {
  serve(authority_.issue("server", ownAddress()));
  EXPECT_EQ(refusal(configuration()), "");
  const auto run = Kestrel::Etcd::openEtcdBackend(configuration());
  run->setField(object("c", "g", "b"), "n", int64_t{2});
  EXPECT_EQ(run->read(object("c", "g", "b")), (Fields{{"n", int64_t{2}}}));
}

TEST_F(EtcdTls, AServerOfAnotherAuthorityIsRefused) {
  serve(stranger_.issue("server", ownAddress()));
  EXPECT_THAT(refusal(configuration()), HasSubstr("SSL certificate problem: unable to get"));
}

TEST_F(EtcdTls, WithoutANamedAuthorityTheSystemsOnesCount) {
  serve(authority_.issue("server", ownAddress()));
  auto settings = configuration();
  settings.cacert.clear();
  EXPECT_THAT(refusal(settings), HasSubstr("SSL certificate problem: unable to get"));
}

TEST_F(EtcdTls, AnExpiredServerIsRefused) {
  serve(authority_.issue("server", ownAddress(), Authority::Validity::kOver));
  EXPECT_THAT(refusal(configuration()),
              HasSubstr("SSL certificate problem: certificate has expired"));
}

TEST_F(EtcdTls, AServerOfAnotherNameIsRefused) {
  serve(authority_.issue("server", "127.0.0.9"));
  EXPECT_THAT(refusal(configuration()), HasSubstr("no alternative certificate subject name"));
}

TEST_F(EtcdTls, AClientThatTheServerKnowsIsAccepted) {
  serveKnownClients();
  EXPECT_EQ(refusal(configurationOf(authority_.issue("client", "127.0.0.1"))), "");
}

TEST_F(EtcdTls, AClientWithAMissingOrWrongCertificateIsRefused) {
  serveKnownClients();
  // Which of the two sides sees the end of the connection first decides about the words.
  EXPECT_THAT(refusal(configuration()), HasSubstr("no member responds"));
  const auto late = authority_.issue("late", "127.0.0.1", Authority::Validity::kOver);
  EXPECT_THAT(refusal(configurationOf(late)), HasSubstr("no member responds"));
  const auto stranger = stranger_.issue("stranger", "127.0.0.1");
  EXPECT_THAT(refusal(configurationOf(stranger)), HasSubstr("no member responds"));
}

TEST_F(EtcdTls, AKeyOfAnotherCertificateIsRefused) {
  serveKnownClients();
  Certificate client = authority_.issue("client", "127.0.0.1");
  client.key = authority_.issue("other", "127.0.0.1").key;
  EXPECT_THAT(refusal(configurationOf(client)), HasSubstr("key"));
}

TEST_F(EtcdTls, AKeyThatOtherUsersMayReadIsNotUsed) {
  serveKnownClients();
  const Certificate client = authority_.issue("client", "127.0.0.1");
  for (const mode_t mode : std::initializer_list<mode_t>{0644, 0604, 0620, 0602}) {
    ASSERT_EQ(chmod(client.key.c_str(), mode), 0);
    EXPECT_THAT(refusal(configurationOf(client)), HasSubstr("other users have access"));
  }
  ASSERT_EQ(chmod(client.key.c_str(), 0640), 0);
  EXPECT_EQ(refusal(configurationOf(client)), "");
}

TEST_F(EtcdTls, TheSecretsOfASessionAreNotLogged) {
  serve(authority_.issue("server", ownAddress()));
  const auto log = folder_.path() / "keys";
  setenv("SSLKEYLOGFILE", log.c_str(), 1);
  EXPECT_EQ(refusal(configuration()), "");
  EXPECT_FALSE(std::filesystem::exists(log));
  EXPECT_STREQ(getenv("SSLKEYLOGFILE"), log.c_str());
}

// Old values must not hide that the fleet no longer accepts the host.
TEST_F(EtcdTls, ARefusedCertificateDoesNotLeadToTheLastKnownGood) {
  serveKnownClients();
  auto settings = configurationOf(authority_.issue("client", "127.0.0.1"));
  settings.snapshot = folder_.path() / "snapshot";
  const auto a = object("c", "g", "a");
  EXPECT_EQ(Kestrel::Etcd::openEtcdBackend(settings)->lookUp(a), (Fields{{"n", int64_t{1}}}));
  const Certificate other = stranger_.issue("stranger", "127.0.0.1");
  settings.cert = other.cert;
  settings.key = other.key;
  const auto run = Kestrel::Etcd::openEtcdBackend(settings);
  EXPECT_NE(refusalOf([&] { run->lookUp(a); }), "") << run->source().problem;
}

TEST_F(EtcdTls, AFileThatIsMissingOrNotACertificateIsNamed) {
  serve(authority_.issue("server", ownAddress()));
  auto settings = configuration();
  settings.cacert = folder_.path() / "none.crt";
  EXPECT_THAT(refusal(settings),
              HasSubstr("none.crt: the file of \"cacert\": No such file or directory"));
  writeFile(settings.cacert, "no certificate");
  EXPECT_THAT(refusal(settings), HasSubstr("none.crt"));
}

TEST_F(EtcdTls, APlainConnectionToATlsServerFails) {
  serve(authority_.issue("server", ownAddress()));
  auto settings = configuration();
  settings.endpoints[0].replace(0, 5, "http");
  EXPECT_THAT(refusal(settings), HasSubstr("no member responds"));
}

}  // namespace
}  // namespace Test
