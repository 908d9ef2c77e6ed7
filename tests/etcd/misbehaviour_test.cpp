// SPDX-License-Identifier: Apache-2.0
// Members that are slow, that send garbage, that contradict themselves: what a run makes of them,
// and how long it takes.
#include <gmock/gmock.h>

#include "etcd_world.h"
#include "fake_server.h"
#include "kestrel/etcd/base64.h"

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

// Under a sanitizer everything takes several times as long.
#ifdef __SANITIZE_ADDRESS__
constexpr int kSlowdown = 10;
#elif defined(__SANITIZE_THREAD__)
constexpr int kSlowdown = 10;
#else
constexpr int kSlowdown = 1;
#endif

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

TEST_F(EtcdMisbehaviour, OpeningAStoreAsksNoServer) {
  (void)store({&good_});
  EXPECT_EQ(good_.connections(), 0);
}

TEST_F(EtcdMisbehaviour, ARunMakesOneRequest) {
  const auto run = store({&good_});
  for (int i = 0; i < 1000; ++i) (void)run->lookUp(object("c", "g", std::to_string(i)));
  EXPECT_EQ(run->lookUp(a_), one_);
  EXPECT_EQ(good_.requests(), 1);
  EXPECT_EQ(good_.connections(), 1);
}

TEST_F(EtcdMisbehaviour, ARunReadsItsPrefixAndTheClusterAgreesOnIt) {
  std::string request;
  const FakeServer server([&](const FakeRequest &received) {
    request = received.path + " " + received.body;
    return rangeOf(kKey, kValue, "41");
  });
  EXPECT_EQ(store({&server})->lookUp(a_), one_);
  EXPECT_EQ(request, "/v3/kv/range {\"key\":\"" + Kestrel::Etcd::toBase64("/kestrel/global/") +
                         "\",\"range_end\":\"" + Kestrel::Etcd::toBase64("/kestrel/global0") +
                         "\",\"limit\":\"10000\"}");
}

TEST_F(EtcdMisbehaviour, SeveralLayersAreOneTransaction) {
  std::vector<std::string> paths;
  const FakeServer server([&](const FakeRequest &received) {
    paths.push_back(received.path);
    return httpResponse(200, R"({"header":{"cluster_id":"1","revision":"8"},"succeeded":true,)"
                             R"("responses":[{"response_range":{"header":{"revision":"8"}}},)"
                             R"({"response_range":{"header":{"revision":"8"}}}]})");
  });
  auto settings = configuration({&server});
  settings.prefixes = {"/kestrel/host/h", "/kestrel"};
  const auto run = Kestrel::Etcd::openEtcdBackend(settings);
  EXPECT_EQ(run->lookUp(a_), std::nullopt);
  EXPECT_EQ(run->lookUp(object("x", "y", "z")), std::nullopt);
  EXPECT_EQ(paths, std::vector<std::string>{"/v3/kv/txn"});
}

TEST_F(EtcdMisbehaviour, LookupsInTurnShareOneConnection) {
  const FakeServer denied([&](const FakeRequest &request) {
    const bool range = request.body.find("range_end") != std::string::npos;
    return range ? refusalResponse(403, 7, "etcdserver: permission denied") : emptyRange();
  });
  const auto run = store({&denied});
  for (int i = 0; i < 20; ++i) {
    EXPECT_EQ(run->lookUp(object("c", "g", std::to_string(i))), std::nullopt);
  }
  EXPECT_EQ(denied.requests(), 22);  // the prefix, the group, and then each key
  EXPECT_EQ(denied.connections(), 1);
}

TEST_F(EtcdMisbehaviour, AfterGarbageTheNextMemberIsAsked) {
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
      rangeOf("/elsewhere/global/c/g/a", kValue),
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
    EXPECT_EQ(run->lookUp(a_), one_) << response.substr(0, 200);
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
  EXPECT_THAT(refusalOf([&] { store({&bad})->lookUp(a_); }), HasSubstr("too large"));
  EXPECT_LE(bad.requests(), 3);  // the prefix, the group, the key
}

TEST_F(EtcdMisbehaviour, ARedirectIsNotFollowed) {
  const FakeServer bad([&](const FakeRequest &) {
    return "HTTP/1.1 307 Elsewhere\r\nLocation: " + good_.url() +
           "/v3/kv/range\r\nContent-Length: 0\r\n\r\n";
  });
  EXPECT_THAT(refusalOf([&] { store({&bad})->lookUp(a_); }), HasSubstr("HTTP status 307"));
  EXPECT_EQ(good_.requests(), 0);
}

TEST_F(EtcdMisbehaviour, AProxyOfTheEnvironmentIsNotUsed) {
  const FakeServer proxy([](const FakeRequest &) { return httpResponse(200, "{}"); });
  for (const char *name : {"http_proxy", "all_proxy", "ALL_PROXY"}) {
    setenv(name, proxy.url().c_str(), 1);
  }
  EXPECT_EQ(store({&good_})->lookUp(a_), one_);
  EXPECT_EQ(proxy.connections(), 0);
}

// A JSON text of many small objects takes a parser with a callback minutes.
TEST_F(EtcdMisbehaviour, AHostileBodyIsRefusedInLessThanASecond) {
  std::string objects = R"({"header":{"revision":"7"},"kvs":[{})";
  while (objects.size() < size_t{3} << 20) objects += ",{}";
  std::string arrays = R"({"header":{"revision":"7"},"x":[[])";
  while (arrays.size() < size_t{3} << 20) arrays += ",[]";
  for (const std::string &body : {objects + "]}", arrays + "]}", std::string(3 << 20, '['),
                                  R"({"a":)" + std::string(3 << 20, '1') + "}"}) {
    const FakeServer bad([&](const FakeRequest &) { return httpResponse(200, body); });
    const auto time = timeOf([&] { EXPECT_EQ(store({&bad, &good_})->lookUp(a_), one_); });
    EXPECT_LT(time, milliseconds(1000) * kSlowdown) << body.substr(0, 50);
  }
}

TEST_F(EtcdMisbehaviour, ASilentMemberCostsARun200Ms) {
  FakeServer *self = nullptr;
  FakeServer slow([&](const FakeRequest &) {
    self->wait(milliseconds(60000));
    return rangeOf(kKey, R"({"n":2})");
  });
  self = &slow;
  const auto run = store({&slow, &good_}, milliseconds(10000));
  const auto first = timeOf([&] { EXPECT_EQ(run->lookUp(a_), one_); });
  EXPECT_GE(first, milliseconds(200));
  EXPECT_LT(first, milliseconds(400) * kSlowdown);
  const auto later = timeOf([&] {
    for (int i = 0; i < 20; ++i) EXPECT_EQ(run->read(a_), one_);
  });
  EXPECT_LT(later, milliseconds(400) * kSlowdown);
  EXPECT_EQ(slow.requests(), 1);
}

TEST_F(EtcdMisbehaviour, TheFirstGoodResponseCounts) {
  FakeServer *self = nullptr;
  FakeServer slow([&](const FakeRequest &) {
    self->wait(milliseconds(400));
    return rangeOf(kKey, kValue);
  });
  self = &slow;
  FakeServer *later = nullptr;
  FakeServer slower([&](const FakeRequest &) {
    later->wait(milliseconds(60000));
    return std::string();
  });
  later = &slower;
  EXPECT_EQ(store({&slow, &slower}, milliseconds(20000))->lookUp(a_), one_);
  EXPECT_EQ(slower.requests(), 1);
}

TEST_F(EtcdMisbehaviour, AResponseThatDripsIsNotWaitedForBeyondTheTime) {
  const FakeServer dripping([](const FakeRequest &) { return rangeOf(kKey, kValue); },
                            milliseconds(20));
  const auto time = timeOf([&] {
    const auto run = store({&dripping}, milliseconds(300));
    for (int i = 0; i < 50; ++i) EXPECT_NE(refusalOf([&] { run->lookUp(a_); }), "");
  });
  EXPECT_GE(time, milliseconds(300));
  EXPECT_LT(time, milliseconds(1500));
  EXPECT_LE(dripping.requests(), 2);  // linearizable, then serializable
}

TEST_F(EtcdMisbehaviour, AllLookupsOfARunTogetherAreBounded) {
  FakeServer *self = nullptr;
  FakeServer slow([&](const FakeRequest &request) {
    const bool range = request.body.find("range_end") != std::string::npos;
    if (!range) self->wait(milliseconds(100));
    return range ? refusalResponse(403, 7, "etcdserver: permission denied") : emptyRange();
  });
  self = &slow;
  auto settings = configuration({&slow});
  settings.runTimeout = milliseconds(1000);
  const auto run = Kestrel::Etcd::openEtcdBackend(settings);
  std::string why;
  const auto time = timeOf([&] {
    for (int i = 0; i < 100; ++i) {
      why = refusalOf([&] { run->lookUp(object("c", "g", std::to_string(i))); });
    }
  });
  EXPECT_GE(time, milliseconds(900));
  EXPECT_LT(time, milliseconds(2000));
  EXPECT_NE(why, "");
}

TEST_F(EtcdMisbehaviour, AMemberOfAnotherClusterIsNotBelieved) {
  int responses = 0;
  const FakeServer first([&](const FakeRequest &) {
    return ++responses == 1 ? rangeOf(kKey, kValue, "7", "1") : std::string();
  });
  const FakeServer other([](const FakeRequest &) { return rangeOf(kKey, R"({"n":2})", "7", "2"); });
  const auto run = store({&first, &other});
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_THAT(refusalOf([&] { run->read(a_); }), HasSubstr("belongs to another cluster"));
}

TEST_F(EtcdMisbehaviour, MembersThatLagBehindTheRunAreAskedAgain) {
  const std::string behind =
      refusalResponse(400, 11, "etcdserver: mvcc: required revision is a future revision");
  int responses = 0;
  const FakeServer server([&](const FakeRequest &) {
    ++responses;
    return responses < 3 ? behind : rangeOf(kKey, kValue);
  });
  EXPECT_EQ(store({&server})->lookUp(a_), one_);
  EXPECT_EQ(responses, 3);
}

TEST_F(EtcdMisbehaviour, AMemberThatNeverCatchesUpIsNotWaitedForBeyondTheTime) {
  const FakeServer server([&](const FakeRequest &) {
    return refusalResponse(400, 11, "etcdserver: mvcc: required revision is a future revision");
  });
  const auto time = timeOf(
      [&] { EXPECT_NE(refusalOf([&] { store({&server}, milliseconds(300))->lookUp(a_); }), ""); });
  EXPECT_LT(time, milliseconds(1000));
  EXPECT_LE(server.requests(), 60);
}

TEST_F(EtcdMisbehaviour, ACommonNameThatAServerRefusesIsTheReason) {
  const FakeServer server([](const FakeRequest &) {
    return httpResponse(
        400,
        "CommonName of client sending a request against gateway will be ignored and "
        "not used as expected\n");
  });
  EXPECT_THAT(refusalOf([&] { store({&server})->lookUp(a_); }),
              HasSubstr("no client certificate with a common name"));
}

TEST_F(EtcdMisbehaviour, AfterARefusalTheNextMemberIsNotAsked) {
  const FakeServer server([&](const FakeRequest &) {
    return refusalResponse(403, 7, "etcdserver: permission denied");
  });
  const auto run = store({&server, &good_});
  for (int i = 0; i < 2; ++i) {
    const std::string why = refusalOf([&] { run->lookUp(a_); });
    EXPECT_THAT(why, HasSubstr(server.url() + ": " + kKey + ": etcdserver: permission denied"));
  }
  EXPECT_EQ(good_.requests(), 0);
}

// libcurl itself repeats a request when a kept connection breaks before the first byte of the
// response.
TEST_F(EtcdMisbehaviour, AChangeIsNotRepeatedWhenAKeptConnectionBreaks) {
  int changes = 0;
  const FakeServer server([&](const FakeRequest &request) {
    if (request.path == "/v3/kv/range") return rangeOf(kKey, kValue);
    ++changes;
    return std::string();  // closes the connection
  });
  const std::string why = refusalOf([&] { store({&server})->setField(a_, "n", int64_t{2}); });
  EXPECT_THAT(why, HasSubstr("whether the change was made is not known"));
  EXPECT_EQ(changes, 1);
}

TEST_F(EtcdMisbehaviour, AChangeWhoseResponseIsLostIsNotMadeTwice) {
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

TEST_F(EtcdMisbehaviour, AMemberThatReceivedAChangeHasAllTheTime) {
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

TEST_F(EtcdMisbehaviour, AWriterThatIsAlwaysOvertakenGivesUp) {
  const std::string overtaken = R"({"header":{"cluster_id":"1","revision":"8"},"responses":[)"
                                R"({"response_range":{"header":{"revision":"8"}}}]})";
  const FakeServer server([&](const FakeRequest &request) {
    return request.path == "/v3/kv/txn" ? httpResponse(200, overtaken) : rangeOf(kKey, kValue);
  });
  const auto time = timeOf([&] {
    EXPECT_THAT(refusalOf([&] { store({&server})->setField(a_, "n", int64_t{2}); }),
                HasSubstr("other writers keep changing it; nothing was changed"));
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
  EXPECT_EQ(run->lookUp(a_), one_);
  EXPECT_EQ(run->read(a_), one_);
  EXPECT_EQ(seen, std::vector<std::string>(2, R"({"name":"u","password":"p"})"));
}

TEST_F(EtcdMisbehaviour, AServerThatAcceptsNoTokenIsAskedTwiceAndNeverAgain) {
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
    EXPECT_THAT(refusalOf([&] { run->lookUp(a_); }), HasSubstr("invalid auth token"));
  }
  EXPECT_EQ(server.requests(), 4);
}

TEST_F(EtcdMisbehaviour, StatusOfAServerThatIsNotEtcdSaysSo) {
  const FakeServer html([](const FakeRequest &request) {
    return request.path == "/v3/kv/range" ? emptyRange() : httpResponse(200, "<html>");
  });
  const FakeServer missing([](const FakeRequest &) { return httpResponse(404, "not found"); });
  const auto details = store({&html, &missing})->health().details;
  ASSERT_GE(details.size(), 3U);
  EXPECT_THAT(details[1].second, HasSubstr("the response is not etcd's: not JSON"));
  EXPECT_THAT(details[2].second, HasSubstr("HTTP status 404"));
}

TEST_F(EtcdMisbehaviour, ControlCharactersOfAServerAreEscaped) {
  const FakeServer server(
      [](const FakeRequest &) { return refusalResponse(400, 3, "\\u001b[2J\\u009b\\nroot# "); });
  EXPECT_THAT(refusalOf([&] { store({&server})->lookUp(a_); }),
              HasSubstr("\\x1B[2J\\xC2\\x9B\\x0Aroot# "));
}

}  // namespace
}  // namespace Test
