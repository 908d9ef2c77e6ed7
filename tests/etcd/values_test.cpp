// SPDX-License-Identifier: Apache-2.0
// Objects and their values on a real server: what is written comes back, what was written by hand
// is read or refused, and every name has a key of its own.
#include <cmath>
#include <limits>

#include "etcd_world.h"

namespace Test {
namespace {

using Kestrel::Fields;
using Kestrel::ObjectId;
using Kestrel::StoredObject;
using Kestrel::Value;

class EtcdValues : public ServersFixture {
 protected:
  EtcdValues() : ServersFixture(1) {}
  const ObjectId id_ = object("host", "pools", "backup");
  const std::string key_ = "host/pools/backup";
};

TEST_F(EtcdValues, EveryTypeComesBackAsItWasSet) {
  const Fields fields = {{"least", std::numeric_limits<int64_t>::min()},
                         {"most", std::numeric_limits<int64_t>::max()},
                         {"zero", int64_t{0}},
                         {"half", 0.5},
                         {"huge", std::numeric_limits<double>::max()},
                         {"tiny", std::numeric_limits<double>::denorm_min()},
                         {"third", 1.0 / 3},
                         {"yes", true},
                         {"no", false},
                         {"empty", std::string()},
                         {"words", std::string("\"a\" \\ b\n\t\xc3\xa9 \xf0\x9f\x98\x80")},
                         {"nul", std::string("a\0b", 3)},
                         {"", std::string("a field without a name")}};
  for (const auto &[name, value] : fields) store()->setField(id_, name, value);
  EXPECT_EQ(store()->read(id_), fields);
}

TEST_F(EtcdValues, IntegerRealBooleanAndTextStayApart) {
  const Fields fields = {
      {"a", int64_t{7}}, {"b", 7.0}, {"c", true}, {"d", std::string("7")}, {"e", 1e22}};
  store()->replace({{id_, fields}});
  EXPECT_EQ(store()->read(id_), fields);
  EXPECT_EQ(rawValue(key_), R"({"a":7,"b":7.0,"c":true,"d":"7","e":1e+22})");
}

TEST_F(EtcdValues, MinusZeroKeepsItsSign) {
  store()->setField(id_, "x", -0.0);
  EXPECT_TRUE(std::signbit(std::get<double>(store()->read(id_)->at("x"))));
}

TEST_F(EtcdValues, WhatEtcdctlPutsIsRead) {
  put(key_, "{ \"sizeMB\": 2048,\n  \"share\": 5e-1, \"on\": true, \"note\": \"by hand\" }\n");
  EXPECT_EQ(store()->read(id_), (Fields{{"sizeMB", int64_t{2048}},
                                        {"share", 0.5},
                                        {"on", true},
                                        {"note", std::string("by hand")}}));
}

TEST_F(EtcdValues, AnObjectWithoutFieldsIsThereAndAnUnknownOneIsNot) {
  put(key_, "{}");
  EXPECT_EQ(store()->read(id_), Fields{});
  EXPECT_EQ(store()->read(object("host", "pools", "other")), std::nullopt);
}

TEST_F(EtcdValues, InfinityAndNotANumberAreRefusedAndChangeNothing) {
  put(key_, R"({"x":1.5})");
  for (const double value : {HUGE_VAL, -HUGE_VAL, std::nan("")}) {
    const std::string why = refusalOf([&] { store()->setField(id_, "x", value); });
    EXPECT_NE(why.find("field \"x\" is " + Kestrel::print(value) + ", for which JSON has no form"),
              std::string::npos)
        << why;
  }
  EXPECT_EQ(rawValue(key_), R"({"x":1.5})");
}

TEST_F(EtcdValues, BytesThatAreNotUtf8AreRefused) {
  EXPECT_NE(refusalOf([&] { store()->setField(id_, "x", std::string("\xff")); }), "");
  EXPECT_NE(refusalOf([&] { store()->setField(id_, "\xff", int64_t{1}); }), "");
  EXPECT_EQ(store()->read(id_), std::nullopt);
}

TEST_F(EtcdValues, AValueOfAMebibyteIsReadAndWritten) {
  const std::string text(size_t{1} << 20, 'x');
  put(key_, "{\"long\":\"" + text + "\"}");
  EXPECT_EQ(store()->read(id_), (Fields{{"long", text}}));
  store()->setField(id_, "short", int64_t{1});
  EXPECT_EQ(store()->read(id_), (Fields{{"long", text}, {"short", int64_t{1}}}));
}

struct BadValue {
  const char *json, *why;
};

class EtcdBadValues : public EtcdValues {};

TEST_F(EtcdBadValues, AreRefusedWithTheirKeyAndNeverOverwritten) {
  const BadValue values[] = {
      {"sizeMB=7", "is not JSON"},
      {"{\"a\":1", "is not JSON"},
      {"{\"a\":1} x", "is not JSON"},
      {"{\"a\":\"\xff\"}", "is not JSON"},
      {"7", "is not a JSON object"},
      {"\"text\"", "is not a JSON object"},
      {"null", "is not a JSON object"},
      {"[{\"a\":1}]", "is not a JSON object"},
      {"{\"a\":{\"b\":1}}", "field \"a\" is an object"},
      {"{\"a\":[1]}", "field \"a\" is an array"},
      {"{\"a\":null}", "field \"a\" is null"},
      {"{\"a\":1,\"a\":2}", "field \"a\" is given twice"},
      {"{\"a\":9223372036854775808}", "does not fit into 64 bits"},
      {"{\"a\":-9223372036854775809}", "does not fit into 64 bits"},
      {"{\"a\":123456789012345678901234567890}", "does not fit into 64 bits"},
      {"{\"a\":1e999}", "out of a real number's range"},
  };
  for (const auto &[json, why] : values) {
    put(key_, json);
    for (const std::string &message :
         {refusalOf([&] { store()->read(id_); }), refusalOf([&] { store()->lookUp(id_); }),
          refusalOf([&] { store()->setField(id_, "b", true); }),
          refusalOf([&] { store()->removeField(id_, "a"); })}) {
      EXPECT_NE(message.find("/kestrel/global/" + key_), std::string::npos) << json << message;
      EXPECT_NE(message.find(why), std::string::npos) << json << ": " << message;
    }
    EXPECT_EQ(rawValue(key_), json);
  }
  EXPECT_TRUE(store()->removeObject(id_));
  EXPECT_EQ(store()->read(id_), std::nullopt);
}

TEST_F(EtcdBadValues, LeaveOtherObjectsReadable) {
  put(key_, "garbage");
  put("host/pools/other", "{\"a\":1}");
  const auto run = store();
  EXPECT_NE(refusalOf([&] { run->read(id_); }), "");
  EXPECT_EQ(run->read(object("host", "pools", "other")), (Fields{{"a", int64_t{1}}}));
}

TEST_F(EtcdValues, EveryNameHasAKeyOfItsOwn) {
  const std::vector<ObjectId> ids = {object("", "", ""),
                                     object("", "", "", "x"),
                                     object("", "", "x"),
                                     object("", "x", ""),
                                     object("x", "", ""),
                                     object("a", "b", "c"),
                                     object("a/b", "", "c"),
                                     object("a", "b/c", ""),
                                     object("a", "b", "c", "d"),
                                     object("a", "b", "c/d"),
                                     object("a%2Fb", "", "c"),
                                     object("a", "b", "c d"),
                                     object("a", "b", "c%20d"),
                                     object("a", "b", "c+d"),
                                     object("a", "b", "%"),
                                     object("\xc3\xa9", "b", "c"),
                                     object("a", "\xe2\x82\xac", ""),
                                     object("a", ".", ".."),
                                     object("a", "b", "c", "/"),
                                     object("a", "b", "c", " "),
                                     object("A", "b", "c"),
                                     object("/", "/", "/"),
                                     object("a", "b", "\n\"\\"),
                                     object("a", "b~-_.", "c")};
  int64_t number = 0;
  for (const ObjectId &id : ids) store()->setField(id, "n", ++number);
  number = 0;
  for (const ObjectId &id : ids) {
    EXPECT_EQ(store()->read(id), (Fields{{"n", ++number}})) << id.component << id.group << id.key;
  }
  EXPECT_EQ(store()->list({}).objects.size(), ids.size());
}

TEST_F(EtcdValues, AnObjectsKeyIsItsPercentEncodedName) {
  store()->setField(object("a/b", "100 %", "\xc3\xa9", "x"), "n", int64_t{1});
  EXPECT_EQ(rawValue("a%2Fb/100%20%25/%C3%A9/x"), R"({"n":1})");
}

}  // namespace
}  // namespace Test
