// SPDX-License-Identifier: Apache-2.0
// Members that are slow, that send garbage, that contradict themselves: what a run makes of them,
// and how long it takes.
#include <gmock/gmock.h>

#include "etcd_world.h"
#include "fake_server.h"

namespace Test {
namespace {

using Kestrel::Fields;
using std::chrono::milliseconds;
using testing::HasSubstr;

const std::string kKey = "/kestrel/global/c/g/a";
const std::string kValue = R"({"n":1})";

std::string refusalResponse(int status, int code, const std::string &message) {
  return httpResponse(status, R"({"error":")" + message + R"(","message":")" + message +
                                  R"(","code":)" + std::to_string(code) + "}");
}

class EtcdMisbehaviour : public testing::Test {
 protected:
  static Kestrel::Configuration configuration(const std::vector<const FakeServer *> &servers,
                                              milliseconds timeout = milliseconds(20000)) {
    Kestrel::Configuration result;
    result.engine = Kestrel::Engine::kEtcd;
    for (const FakeServer *server : servers) result.endpoints.push_back(server->url());
    result.timeout = timeout;
    return result;
  }
  static std::shared_ptr<Kestrel::Backend> store(const std::vector<const FakeServer *> &servers,
                                                 milliseconds timeout = milliseconds(20000)) {
    return Kestrel::Etcd::openEtcdBackend(configuration(servers, timeout));
  }

  const Kestrel::ObjectId a_ = object("c", "g", "a");
  const Fields one_ = {{"n", int64_t{1}}};
  FakeServer good_{[](const FakeRequest &) { return rangeOf(kKey, kValue); }};
};

TEST_F(EtcdMisbehaviour, OpeningAStoreAsksNobody) {
  (void)store({&good_});
  EXPECT_EQ(good_.connections(), 0);
}

TEST_F(EtcdMisbehaviour, AllLookupsOfARunShareOneConnection) {
  const auto run = store({&good_});
  for (int i = 0; i < 50; ++i) EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(good_.requests(), 50);
  EXPECT_EQ(good_.connections(), 1);
}

TEST_F(EtcdMisbehaviour, LookupsAreSerializableAndAfterTheFirstOfItsRevision) {
  std::vector<std::string> bodies;
  const FakeServer server([&](const FakeRequest &request) {
    bodies.push_back(request.path + " " + request.body);
    return rangeOf(kKey, kValue, "41");
  });
  const auto run = store({&server});
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(run->read(a_), one_);
  ASSERT_EQ(bodies.size(), 2U);
  const std::string begin = R"(/v3/kv/range {"key":"L2tlc3RyZWwvZ2xvYmFsL2MvZy9h",)";
  EXPECT_EQ(bodies[0], begin + R"("serializable":true})");
  EXPECT_EQ(bodies[1], begin + R"("revision":"41","serializable":true})");
}

TEST_F(EtcdMisbehaviour, GarbageIsAFailureOfTheMemberAndTheNextOneIsAsked) {
  const std::string responses[] = {
      "garbage without a head\r\n\r\n",
      "HTTP/1.1 200 OK\r\nConnection: close\r\nContent-Length: 100\r\n\r\nshort",
      httpResponse(200, ""),
      httpResponse(200, "<html>"),
      httpResponse(200, "[]"),
      httpResponse(200, "{}"),
      httpResponse(200, R"({"header":7})"),
      httpResponse(200, R"({"header":{}})"),
      httpResponse(200, R"({"header":{"revision":"0"}})"),
      httpResponse(200, R"({"header":{"revision":"-3"}})"),
      httpResponse(200, R"({"header":{"revision":"x"}})"),
      httpResponse(200, R"({"header":{"revision":"99999999999999999999"}})"),
      httpResponse(200, R"({"header":{"revision":"7"},"kvs":7})"),
      httpResponse(200, R"({"header":{"revision":"7"},"kvs":[7]})"),
      httpResponse(200, R"({"header":{"revision":"7"},"kvs":[{"key":"!"}]})"),
      httpResponse(200, R"({"header":{"revision":"7"},"more":"yes"})"),
      httpResponse(200, std::string(100000, '[')),
      rangeOf("/kestrel/global/c/g/b", kValue),
      httpResponse(404, "404 page not found"),
      httpResponse(500, "{}"),
      httpResponse(502, "Bad gateway"),
      httpResponse(302, ""),
      refusalResponse(503, 14, "etcdserver: request timed out"),
      refusalResponse(501, 12, "Not Implemented"),
      "",
  };
  for (const std::string &response : responses) {
    const FakeServer bad([&](const FakeRequest &) { return response; });
    const auto run = store({&bad, &good_});
    EXPECT_EQ(run->read(a_), one_) << response.substr(0, 200);
    const int asked = bad.requests();
    EXPECT_EQ(run->read(a_), one_);
    EXPECT_EQ(bad.requests(), asked) << "asked again after: " << response.substr(0, 200);
  }
}

TEST_F(EtcdMisbehaviour, AnEndlessAnswerIsCutOff) {
  const std::string block(size_t{1} << 20, 'x');
  std::string endless = "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n";
  for (int i = 0; i < 32; ++i) endless += "100000\r\n" + block + "\r\n";
  const FakeServer bad([&](const FakeRequest &) { return endless; });
  EXPECT_EQ(store({&bad, &good_})->read(a_), one_);
  EXPECT_THAT(refusalOf([&] { store({&bad})->read(a_); }), HasSubstr("too large"));
}

TEST_F(EtcdMisbehaviour, ARedirectIsNotFollowed) {
  const FakeServer bad([&](const FakeRequest &) {
    return "HTTP/1.1 307 Elsewhere\r\nLocation: " + good_.url() +
           "/v3/kv/range\r\nContent-Length: 0\r\n\r\n";
  });
  EXPECT_THAT(refusalOf([&] { store({&bad})->read(a_); }), HasSubstr("HTTP status 307"));
  EXPECT_EQ(good_.requests(), 0);
}

TEST_F(EtcdMisbehaviour, AProxyOfTheEnvironmentIsNotUsed) {
  const FakeServer proxy([](const FakeRequest &) { return httpResponse(200, "{}"); });
  for (const char *name : {"http_proxy", "all_proxy", "ALL_PROXY"}) {
    setenv(name, proxy.url().c_str(), 1);
  }
  EXPECT_EQ(store({&good_})->read(a_), one_);
  EXPECT_EQ(proxy.connections(), 0);
}

TEST_F(EtcdMisbehaviour, ASlowMemberCostsItsPartOfOneLookup) {
  FakeServer *self = nullptr;
  FakeServer slow([&](const FakeRequest &) {
    self->wait(milliseconds(60000));
    return rangeOf(kKey, R"({"n":2})");
  });
  self = &slow;
  const auto run = store({&slow, &good_}, milliseconds(1000));
  const auto first = timeOf([&] { EXPECT_EQ(run->read(a_), one_); });
  EXPECT_GE(first, milliseconds(500));
  EXPECT_LT(first, milliseconds(1000));
  const auto later = timeOf([&] {
    for (int i = 0; i < 20; ++i) EXPECT_EQ(run->read(a_), one_);
  });
  EXPECT_LT(later, milliseconds(1000));
  EXPECT_EQ(slow.requests(), 1);
}

TEST_F(EtcdMisbehaviour, AMemberThatIsSlowButInTimeIsWaitedFor) {
  FakeServer *self = nullptr;
  FakeServer slow([&](const FakeRequest &) {
    self->wait(milliseconds(100));
    return rangeOf(kKey, kValue);
  });
  self = &slow;
  EXPECT_EQ(store({&slow}, milliseconds(10000))->read(a_), one_);
}

TEST_F(EtcdMisbehaviour, AnAnswerThatDripsIsNotWaitedForBeyondTheTime) {
  const FakeServer dripping([](const FakeRequest &) { return rangeOf(kKey, kValue); },
                            milliseconds(20));
  const auto time = timeOf([&] {
    const auto run = store({&dripping}, milliseconds(300));
    for (int i = 0; i < 50; ++i) EXPECT_NE(refusalOf([&] { run->read(a_); }), "");
  });
  EXPECT_GE(time, milliseconds(300));
  EXPECT_LT(time, milliseconds(1500));
  EXPECT_EQ(dripping.requests(), 1);
}

TEST_F(EtcdMisbehaviour, AMemberOfAnotherClusterIsNotBelieved) {
  int responses = 0;
  const FakeServer first([&](const FakeRequest &) {
    return ++responses == 1 ? rangeOf(kKey, kValue, "7", "1") : std::string();
  });
  const FakeServer strange(
      [](const FakeRequest &) { return rangeOf(kKey, R"({"n":2})", "7", "2"); });
  const auto run = store({&first, &strange});
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_THAT(refusalOf([&] { run->read(a_); }), HasSubstr("belongs to another cluster"));
}

TEST_F(EtcdMisbehaviour, AMemberThatLagsBehindTheRunIsGivenAMoment) {
  const std::string behind =
      refusalResponse(400, 11, "etcdserver: mvcc: required revision is a future revision");
  int responses = 0;
  const FakeServer server([&](const FakeRequest &) {
    ++responses;
    return responses == 2 || responses == 3 ? behind : rangeOf(kKey, kValue);
  });
  const auto run = store({&server});
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(responses, 4);
}

TEST_F(EtcdMisbehaviour, AMemberThatNeverCatchesUpIsPassedOver) {
  const FakeServer server([&](const FakeRequest &) {
    return refusalResponse(400, 11, "etcdserver: mvcc: required revision is a future revision");
  });
  EXPECT_EQ(store({&server, &good_}, milliseconds(500))->read(a_), one_);
  EXPECT_LE(server.requests(), 101);
}

TEST_F(EtcdMisbehaviour, AClientCertificateThatAServerWithUsersCannotTakeIsNamedAsTheReason) {
  const FakeServer server([](const FakeRequest &) {
    return httpResponse(
        400,
        "CommonName of client sending a request against gateway will be ignored and "
        "not used as expected\n");
  });
  EXPECT_THAT(refusalOf([&] { store({&server})->read(a_); }),
              HasSubstr("no client certificate with a common name"));
}

TEST_F(EtcdMisbehaviour, ARefusalIsNoReasonToAskTheNextMember) {
  const FakeServer server([&](const FakeRequest &) {
    return refusalResponse(403, 7, "etcdserver: permission denied");
  });
  const auto run = store({&server, &good_});
  for (int i = 0; i < 2; ++i) {
    const std::string why = refusalOf([&] { run->read(a_); });
    EXPECT_THAT(why, HasSubstr(server.url() + ": " + kKey + ": etcdserver: permission denied"));
  }
  EXPECT_EQ(good_.requests(), 0);
}

TEST_F(EtcdMisbehaviour, AChangeWhoseAnswerIsLostIsNotMadeTwice) {
  const auto broken = [](const FakeRequest &request) {
    return request.path == "/v3/kv/range" ? rangeOf(kKey, kValue) : "HTTP/1.1 garbage\r\n\r\n";
  };
  const FakeServer first(broken), second(broken);
  const std::string why = refusalOf([&] {
    store({&first, &second})->setField(a_, "n", int64_t{2});
  });
  EXPECT_THAT(why, HasSubstr("whether the change was made is not known"));
  EXPECT_EQ(second.requests(), 0);
}

TEST_F(EtcdMisbehaviour, AMemberThatHasGotAChangeHasAllTheTimeThereIs) {
  FakeServer *self = nullptr;
  FakeServer slow([&](const FakeRequest &) {
    self->wait(milliseconds(600));
    return httpResponse(200, R"({"header":{"cluster_id":"1","revision":"8"},"deleted":"1"})");
  });
  self = &slow;
  EXPECT_TRUE(store({&slow, &good_, &good_}, milliseconds(1500))->removeObject(a_));
}

TEST_F(EtcdMisbehaviour, AChangeThatNeverReachedAMemberGoesToTheNext) {
  const FakeServer server([](const FakeRequest &request) {
    return request.path == "/v3/kv/deleterange"
               ? httpResponse(200, R"({"header":{"cluster_id":"1","revision":"8"},"deleted":"1"})")
               : std::string();
  });
  auto settings = configuration({&server});
  settings.endpoints.insert(settings.endpoints.begin(), "http://" + freePlace());
  EXPECT_TRUE(Kestrel::Etcd::openEtcdBackend(settings)->removeObject(a_));
}

TEST_F(EtcdMisbehaviour, AWriterThatIsAlwaysOvertakenGivesUpAndSaysSo) {
  const std::string overtaken = R"({"header":{"cluster_id":"1","revision":"8"},"responses":[)"
                                R"({"response_range":{"header":{"revision":"8"}}}]})";
  const FakeServer server([&](const FakeRequest &request) {
    return request.path == "/v3/kv/txn" ? httpResponse(200, overtaken) : rangeOf(kKey, kValue);
  });
  const auto time = timeOf([&] {
    EXPECT_THAT(refusalOf([&] { store({&server})->setField(a_, "n", int64_t{2}); }),
                HasSubstr("others keep changing it; nothing was changed"));
  });
  EXPECT_LT(time, milliseconds(15000));
  EXPECT_LE(server.requests(), 101);
}

TEST_F(EtcdMisbehaviour, ATokenIsAskedForOnceAndRenewedOnce) {
  TempFolder folder;
  writeFile(folder.path() / "password", "p");
  std::filesystem::permissions(folder.path() / "password", std::filesystem::perms(0600));
  std::vector<std::string> seen;
  const FakeServer server([&](const FakeRequest &request) {
    if (request.path == "/v3/auth/authenticate") {
      seen.push_back(request.body);
      return httpResponse(200, R"({"header":{},"token":"t)" + std::to_string(seen.size()) + "\"}");
    }
    const bool known = request.head.find("Authorization: t2") != std::string::npos;
    return known ? rangeOf(kKey, kValue)
                 : refusalResponse(401, 16, "etcdserver: invalid auth token");
  });
  auto settings = configuration({&server});
  settings.user = "u";
  settings.passwordFile = folder.path() / "password";
  const auto run = Kestrel::Etcd::openEtcdBackend(settings);
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(seen, std::vector<std::string>(2, R"({"name":"u","password":"p"})"));
}

TEST_F(EtcdMisbehaviour, AServerThatTakesNoTokenIsAskedTwiceAndNeverAgain) {
  TempFolder folder;
  writeFile(folder.path() / "password", "p");
  std::filesystem::permissions(folder.path() / "password", std::filesystem::perms(0600));
  const FakeServer server([&](const FakeRequest &request) {
    if (request.path == "/v3/auth/authenticate") return httpResponse(200, R"({"token":"t"})");
    return refusalResponse(401, 16, "etcdserver: invalid auth token");
  });
  auto settings = configuration({&server});
  settings.user = "u";
  settings.passwordFile = folder.path() / "password";
  const auto run = Kestrel::Etcd::openEtcdBackend(settings);
  for (int i = 0; i < 10; ++i) {
    EXPECT_THAT(refusalOf([&] { run->read(a_); }), HasSubstr("invalid auth token"));
  }
  EXPECT_EQ(server.requests(), 4);
}

TEST_F(EtcdMisbehaviour, StatusOfAServerThatIsNoEtcdSaysSo) {
  const FakeServer html([](const FakeRequest &) { return httpResponse(200, "<html>"); });
  const FakeServer missing([](const FakeRequest &) { return httpResponse(404, "not found"); });
  const auto details = store({&html, &missing})->details();
  ASSERT_EQ(details.size(), 3U);
  EXPECT_THAT(details[1].second, HasSubstr("the response is not etcd's: not JSON"));
  EXPECT_THAT(details[2].second, HasSubstr("HTTP status 404"));
}

}  // namespace
}  // namespace Test
