// SPDX-License-Identifier: Apache-2.0
// The parts of the etcd store that need no server: base64, keys, values, the gateway's texts, what
// refusals mean, and the password's file.
#include <gmock/gmock.h>
#include <sys/stat.h>

#include <cmath>
#include <set>

#include "etcd_world.h"
#include "kestrel/etcd/base64.h"
#include "kestrel/etcd/object_key.h"
#include "kestrel/etcd/object_value.h"
#include "kestrel/etcd/password_file.h"
#include "kestrel/etcd/protocol.h"
#include "kestrel/etcd/refusal.h"

namespace Kestrel::Etcd {
namespace {

using testing::HasSubstr;

TEST(Base64, EachLengthHasItsPadding) {
  EXPECT_EQ(toBase64(""), "");
  EXPECT_EQ(toBase64("f"), "Zg==");
  EXPECT_EQ(toBase64("fo"), "Zm8=");
  EXPECT_EQ(toBase64("foo"), "Zm9v");
  EXPECT_EQ(toBase64("foob"), "Zm9vYg==");
  EXPECT_EQ(toBase64("\xff\xfe\xfd"), "//79");
}

TEST(Base64, EveryByteComesBack) {
  for (size_t length = 0; length < 300; ++length) {
    std::string bytes;
    for (size_t i = 0; i < length; ++i) bytes += static_cast<char>(i * 7 + length);
    EXPECT_EQ(fromBase64(toBase64(bytes)), bytes);
  }
}

TEST(Base64, WhatIsNotBase64IsRefused) {
  for (const char *text :
       {"Z", "Zg", "Zg=", "Zg==Zg==", "Z===", "====", "Zm9!", "Zm9v\n", "Zm-_", "=Zm9", "Z=m9"}) {
    EXPECT_EQ(fromBase64(text), std::nullopt) << text;
  }
}

TEST(ObjectKey, EncodesAllButUnreservedBytes) {
  EXPECT_EQ(percentEncode("azAZ09-._~"), "azAZ09-._~");
  EXPECT_EQ(percentEncode("/% +\xc3\xa9\x7f"), "%2F%25%20%2B%C3%A9%7F");
  EXPECT_EQ(percentEncode(std::string_view("\0", 1)), "%00");
}

TEST(ObjectKey, EveryByteComesBack) {
  std::string all;
  for (int byte = 0; byte < 256; ++byte) all += static_cast<char>(byte);
  EXPECT_EQ(percentDecode(percentEncode(all)), all);
}

TEST(ObjectKey, APercentSignWithoutTwoDigitsIsRefused) {
  for (const char *text : {"%", "%2", "a%", "%g0", "%0g", "% 1", "%+1"}) {
    EXPECT_EQ(percentDecode(text), std::nullopt) << text;
  }
}

TEST(ObjectKey, BeginsWithPrefixAndNameSpace) {
  const ObjectId id{"k", "c", "g", ""};
  EXPECT_EQ(objectKey("/p", id), "/p/" + KestrelConfigStore::sGlobalNamespace + "/c/g/k");
}

TEST(ObjectKey, HasAFourthPartOnlyForAnExtraThatIsNotEmpty) {
  EXPECT_EQ(objectKey("/p", {"k", "c", "g", "e"}), "/p/global/c/g/k/e");
  EXPECT_EQ(objectKey("/p", {"", "", "", ""}), "/p/global///");
  EXPECT_EQ(objectKey("/p", {"", "", "", "e"}), "/p/global////e");
}

TEST(ObjectKey, EveryShortIdHasOneKeyAndComesBackFromIt) {
  const std::vector<std::string> parts = {"", "a", "/", "%", "%2F", "a/", "/a", "\xc3\xa9"};
  std::map<std::string, int> keys;
  for (const auto &component : parts) {
    for (const auto &group : parts) {
      for (const auto &key : parts) {
        for (const auto &extra : parts) {
          const ObjectId id{key, component, group, extra};
          const std::string text = objectKey("/p", id);
          EXPECT_EQ(++keys[text], 1) << text;
          const auto back = objectId("/p", text);
          ASSERT_TRUE(back) << text;
          EXPECT_TRUE(back->key == key && back->component == component && back->group == group &&
                      back->extra == extra)
              << text;
        }
      }
    }
  }
}

TEST(ObjectKey, AKeyThatNoIdHasIsNotAnObject) {
  for (const char *key :
       {"/p/global", "/p/global/a", "/p/global/a/b", "/p/global/a/b/c/d/e", "/p/global/a/b/c/",
        "/p/global/a/b/%2f", "/p/global/a/b/%41", "/p/global/a/b/ ", "/q/global/a/b/c",
        "/p/other/a/b/c", "/p/global/a/b/%"}) {
    EXPECT_EQ(objectId("/p", key).has_value(), false) << key;
  }
}

TEST(ObjectKey, ASelectionEndsAfterItsKeysAndBeforeAllOthers) {
  const std::string key = selectionKey("/p", {"a", {}});
  EXPECT_EQ(key, "/p/global/a/");
  EXPECT_EQ(endOfPrefix(key), "/p/global/a0");
  EXPECT_EQ(selectionKey("/p", {}), "/p/global/");
  EXPECT_EQ(selectionKey("/p", {"", "g/"}), "/p/global//g%2F/");
}

TEST(ObjectValue, AnEmptyObjectHasNoFields) {
  EXPECT_EQ(parseFields("{}"), Fields{});
  EXPECT_EQ(parseFields(" \n{ } \n"), Fields{});
  EXPECT_EQ(formatFields({}), "{}");
}

TEST(ObjectValue, TheFormOfANumberIsItsType) {
  const Fields fields = parseFields(R"({"a":7,"b":7.0,"c":7e0,"d":-0,"e":-0.0,"f":1E2})");
  EXPECT_EQ(fields.at("a"), Value(int64_t{7}));
  EXPECT_EQ(fields.at("b"), Value(7.0));
  EXPECT_EQ(fields.at("c"), Value(7.0));
  EXPECT_EQ(fields.at("d"), Value(int64_t{0}));
  EXPECT_TRUE(std::signbit(std::get<double>(fields.at("e"))));
  EXPECT_EQ(fields.at("f"), Value(100.0));
}

TEST(ObjectValue, TheWholeRangeOf64BitsIsAnInteger) {
  EXPECT_EQ(parseFields(R"({"a":9223372036854775807})").at("a"), Value(INT64_MAX));
  EXPECT_EQ(parseFields(R"({"a":-9223372036854775808})").at("a"), Value(INT64_MIN));
}

TEST(ObjectValue, AnIntegerBeyond64BitsIsNotMadeAReal) {
  for (const char *json : {R"({"a":9223372036854775808})", R"({"a":18446744073709551615})",
                           R"({"a":18446744073709551616})", R"({"a":-9223372036854775809})"}) {
    EXPECT_THROW(parseFields(json), ValueError) << json;
  }
}

TEST(ObjectValue, DepthIsRefusedAtItsFirstStep) {
  std::string deep = "{\"a\":";
  for (int i = 0; i < 1000000; ++i) deep += "[";
  EXPECT_THROW(parseFields(deep), ValueError);
  EXPECT_THROW(parseFields(std::string(1000000, '{')), ValueError);
}

TEST(ObjectValue, AnyCutOfAValueIsRefused) {
  const std::string json = R"({"a":1,"b":0.5,"c":true,"d":"text \u00e9"})";
  for (size_t length = 0; length < json.size(); ++length) {
    EXPECT_THROW(parseFields(json.substr(0, length)), ValueError) << length;
  }
  EXPECT_EQ(parseFields(json).size(), 4U);
}

TEST(ObjectValue, WhatIsFormattedReadsBack) {
  const Fields fields = {{"\"\\\n\xc3\xa9", std::string("\"\\\n\0\x1f", 5)},
                         {"r", 0.1},
                         {"s", 1e-300},
                         {"t", -1e300},
                         {"u", 123456789.0}};
  EXPECT_EQ(parseFields(formatFields(fields)), fields);
}

TEST(Protocol, ZeroAndEmptyAreLeftOut) {
  const ReadRequest one{{{"k", ""}}, 0, 0, false};
  EXPECT_EQ(readText(one), R"({"key":"aw=="})");
  EXPECT_EQ(readText({{{"k", "l"}}, 5, 9, true}),
            R"({"key":"aw==","range_end":"bA==","limit":"5","revision":"9","serializable":true})");
  const ReadResponse response = readResponse(one, R"({"header":{"revision":"3"}})");
  EXPECT_EQ(response.header.revision, 3);
  ASSERT_EQ(response.ranges.size(), 1U);
  EXPECT_TRUE(response.ranges[0].found.empty());
  EXPECT_FALSE(response.ranges[0].more);
}

TEST(Protocol, AKeyWithoutAValueHasAnEmptyOne) {
  const auto response =
      readResponse({{{"k", ""}}, 0, 0, false},
                   R"({"header":{"revision":"9"},"kvs":[{"key":"aw==","mod_revision":"4"}]})");
  ASSERT_EQ(response.ranges[0].found.size(), 1U);
  EXPECT_EQ(response.ranges[0].found[0].key, "k");
  EXPECT_EQ(response.ranges[0].found[0].value, "");
  EXPECT_EQ(response.ranges[0].found[0].modRevision, 4);
}

TEST(Protocol, SeveralRangesAreOneTransactionAndComeBackInOrder) {
  const ReadRequest two{{{"k", ""}, {"l", ""}}, 0, 0, false};
  EXPECT_STREQ(readPath(two), kTransactionPath);
  EXPECT_EQ(readText(two), R"({"success":[{"request_range":{"key":"aw=="}},)"
                           R"({"request_range":{"key":"bA=="}}]})");
  const auto response = readResponse(
      two, R"({"header":{"revision":"9"},"succeeded":true,"responses":[{"response_range":{}},)"
           R"({"response_range":{"kvs":[{"key":"bA==","value":"dg=="}]}}]})");
  EXPECT_TRUE(response.ranges[0].found.empty());
  ASSERT_EQ(response.ranges[1].found.size(), 1U);
  EXPECT_EQ(response.ranges[1].found[0].value, "v");
  EXPECT_THROW(readResponse(two, R"({"header":{"revision":"9"}})"), ProtocolError);
}

TEST(JsonTree, DepthAndNumberOfValuesAreLimited) {
  const std::string deepest = std::string(kMaxJsonDepth, '[') + std::string(kMaxJsonDepth, ']');
  EXPECT_NO_THROW(parseJson(deepest));
  EXPECT_THROW(parseJson("[" + deepest + "]"), ProtocolError);
  std::string many = "[0";
  for (size_t i = 2; i < kMaxJsonValues; ++i) many += ",0";
  EXPECT_NO_THROW(parseJson(many + "]"));
  EXPECT_THROW(parseJson(many + ",0]"), ProtocolError);
}

TEST(JsonTree, EveryKindIsRead) {
  const JsonTree tree = parseJson(R"({"a":[null,true,-7,1.5,"x"],"b":{"c":""},"d":null})");
  ASSERT_NE(tree.find("a"), nullptr);
  const auto &items = tree.find("a")->items;
  ASSERT_EQ(items.size(), 5U);
  EXPECT_EQ(items[0].kind, JsonTree::Kind::kNull);
  EXPECT_TRUE(items[1].truth);
  EXPECT_EQ(items[2].text, "-7");
  EXPECT_EQ(items[3].text, "1.5");
  EXPECT_EQ(items[4].text, "x");
  EXPECT_EQ(tree.find("b")->find("c")->text, "");
  EXPECT_EQ(tree.find("d"), nullptr);
  for (const char *text : {"", "{", "[1,]", "{\"a\"}", "nul", "1 2"}) {
    EXPECT_THROW(parseJson(text), ProtocolError) << text;
  }
}

TEST(Protocol, AChangeComparesTheRevision) {
  EXPECT_EQ(changeText({{"k", 4, "v"}}),
            R"({"compare":[{"key":"aw==","target":"MOD","result":"EQUAL","mod_revision":"4"}],)"
            R"("success":[{"request_put":{"key":"aw==","value":"dg=="}}],)"
            R"("failure":[{"request_range":{"key":"aw=="}}]})");
  EXPECT_THAT(changeText({{"k", 4, std::nullopt}}),
              HasSubstr(R"("success":[{"request_delete_range":{"key":"aw=="}}])"));
}

TEST(Protocol, AChangeThatWasNotMadeReturnsWhatTheKeyHolds) {
  const auto done = readChange(1, R"({"header":{},"succeeded":true,"responses":[{}]})");
  EXPECT_TRUE(done.done);
  const auto gone = readChange(1, R"({"header":{},"responses":[{"response_range":{}}]})");
  EXPECT_FALSE(gone.done);
  ASSERT_EQ(gone.found.size(), 1U);
  EXPECT_FALSE(gone.found[0]);
  const auto other = readChange(
      1,
      R"({"header":{},"responses":[{"response_range":{"kvs":[{"key":"aw==","value":"dg=="}]}}]})");
  ASSERT_TRUE(other.found.at(0));
  EXPECT_EQ(other.found[0]->value, "v");
  EXPECT_THROW(readChange(1, R"({"header":{}})"), ProtocolError);
  EXPECT_THROW(readChange(1, R"({"header":{},"responses":[7]})"), ProtocolError);
  EXPECT_THROW(readChange(1, R"({"header":{},"responses":[{}]})"), ProtocolError);
}

TEST(Protocol, ATokenThatWouldBreakAHeaderIsRefused) {
  EXPECT_EQ(readToken(R"({"token":"a.b"})"), "a.b");
  EXPECT_THROW(readToken(R"({"token":"a\r\nb"})"), ProtocolError);
  EXPECT_THROW(readToken(R"({"token":""})"), ProtocolError);
  EXPECT_THROW(readToken("{}"), ProtocolError);
}

TEST(Protocol, ARefusalHasANumberAndWords) {
  const auto refusal = readRefusal(R"({"error":"e","message":"m","code":7})");
  ASSERT_TRUE(refusal);
  EXPECT_EQ(refusal->code, 7);
  EXPECT_EQ(refusal->message, "m");
  EXPECT_EQ(readRefusal(R"({"error":"e","code":7})")->message, "e");
  for (const char *json : {"7", "[]", "{}", R"({"code":7})", R"({"error":"e"})",
                           R"({"error":7,"code":7})", R"({"error":"e","code":"7"})"}) {
    EXPECT_FALSE(readRefusal(json)) << json;
  }
  EXPECT_THROW(readRefusal(""), ProtocolError);
}

TEST(Refusal, IsUnderstoodByItsNumberAndItsText) {
  const auto meaning = [](int64_t code, const char *text) {
    return meaningOf({code, text}, false);
  };
  EXPECT_EQ(meaning(3, "etcdserver: duplicate key given in txn request"), Meaning::kRefused);
  EXPECT_EQ(meaning(3, "etcdserver: user name is empty"), Meaning::kToken);
  EXPECT_EQ(meaning(3, "etcdserver: revision of auth store is old"), Meaning::kToken);
  EXPECT_EQ(meaning(7, "etcdserver: permission denied"), Meaning::kRefused);
  EXPECT_EQ(meaning(9, "etcdserver: authentication is not enabled"), Meaning::kNoUsers);
  EXPECT_EQ(meaning(11, "etcdserver: mvcc: required revision has been compacted"),
            Meaning::kCompacted);
  EXPECT_EQ(meaning(11, "etcdserver: mvcc: required revision is a future revision"),
            Meaning::kMoment);
  EXPECT_EQ(meaning(14, "etcdserver: no leader"), Meaning::kMoment);
  EXPECT_EQ(meaning(14, "etcdserver: leader changed"), Meaning::kMoment);
  EXPECT_EQ(meaning(14, "etcdserver: server stopped"), Meaning::kMember);
  // A change that may have been begun is not sent again.
  EXPECT_EQ(meaningOf({14, "etcdserver: leader changed"}, true), Meaning::kMember);
  EXPECT_EQ(meaning(16, "etcdserver: invalid auth token"), Meaning::kToken);
  EXPECT_EQ(meaning(99, "whatever"), Meaning::kRefused);
}

TEST(Refusal, AFullStoreIsRefusedAndABusyMemberIsSkipped) {
  EXPECT_EQ(meaningOf({8, "etcdserver: too many requests"}, false), Meaning::kMember);
  EXPECT_EQ(meaningOf({8, "etcdserver: mvcc: database space exceeded"}, true), Meaning::kRefused);
}

class PasswordFile : public testing::Test {
 protected:
  std::string write(const std::string &text, mode_t mode = 0600) const {
    const std::string path = folder_.path() / "password";
    unlink(path.c_str());
    ::Test::writeFile(path, text);
    chmod(path.c_str(), mode);
    return path;
  }
  ::Test::TempFolder folder_;
};

TEST_F(PasswordFile, ItsOneLineIsThePassword) {
  EXPECT_EQ(readPassword(write("secret\n")), "secret");
  EXPECT_EQ(readPassword(write("secret", 0400)), "secret");
  EXPECT_EQ(readPassword(write(" two words \n")), " two words ");
}

TEST_F(PasswordFile, IsRefusedWhenOthersHaveAccess) {
  for (const mode_t mode :
       std::initializer_list<mode_t>{0644, 0640, 0604, 0620, 0602, 0610, 0601}) {
    const std::string why = ::Test::refusalOf([&] { (void)readPassword(write("secret", mode)); });
    EXPECT_THAT(why, HasSubstr("others than its owner have access"));
    EXPECT_THAT(why, testing::Not(HasSubstr("secret")));
  }
}

TEST_F(PasswordFile, IsRefusedUnlessItHoldsOnePassword) {
  const auto refusal = [&](const std::string &text) {
    return ::Test::refusalOf([&] { (void)readPassword(write(text)); });
  };
  EXPECT_THAT(refusal(""), HasSubstr("is empty"));
  EXPECT_THAT(refusal("\n"), HasSubstr("is empty"));
  EXPECT_THAT(refusal("one\ntwo\n"), HasSubstr("more than one line"));
  EXPECT_THAT(refusal(std::string(4097, 'x')), HasSubstr("larger than 4096 bytes"));
}

TEST_F(PasswordFile, MustBeAFileThatIsThere) {
  const std::string path = folder_.path() / "none";
  EXPECT_THAT(::Test::refusalOf([&] { (void)readPassword(path); }),
              HasSubstr("none: the password file: No such file or directory"));
  EXPECT_THAT(::Test::refusalOf([&] { (void)readPassword(folder_.path()); }),
              HasSubstr("not a regular file"));
  ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
  EXPECT_THAT(::Test::refusalOf([&] { (void)readPassword(path); }),
              HasSubstr("not a regular file"));
}

TEST(FreePlace, IsAnotherOneAtEachCall) {
  // Of that many ports drawn at random from some 28,000, two are almost certainly the same.
  constexpr size_t kCalls = 1000;
  std::set<std::string> places;
  for (size_t i = 0; i < kCalls; ++i) places.insert(::Test::freePlace());
  EXPECT_EQ(places.size(), kCalls);
}

}  // namespace
}  // namespace Kestrel::Etcd
