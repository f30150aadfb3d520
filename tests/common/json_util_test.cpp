// Catches bytes that JSON loses, two values taken for one, and errors that do not show the whole object.
#include "common/json_util.h"

#include <sys/resource.h>
#include <unistd.h>

#include <fstream>
#include <new>

#include "tests/support/library_test.h"

namespace ferrox {

namespace {

using test::FailureOf;
using test::Parse;

/// What becomes of 3 when the member is read into it.
template <typename T>
T Read(const std::string& member) {
  T out{3};
  GetJsonValue(out, Parse("{\"k\":" + member + "}"), "k", false);
  return out;
}

template <typename T>
std::string Failure(const std::string& object, bool required) {
  T out{};
  return FailureOf([&] { GetJsonValue(out, Parse(object), "k", required); });
}

TEST(JsonUtilTest, ErrorTextOfADeepDocumentIsBounded) {
  const std::string members(20000, '1');
  std::string text = std::string(900, '[');
  for (const char member : members) (text += member) += ',';
  Json::Value deep;
  ASSERT_TRUE(fromString(deep, text + "1" + std::string(900, ']')));
  EXPECT_LT(AppendData(deep).size(), 70000U);
}

#if !defined(FERROX_SANITIZED)
TEST(JsonUtilDeathTest, TextThatMemoryIsTooShortForIsNoText) {
  const auto write_with_little_memory = [] {
    Json::Value value(Json::arrayValue);
    for (int i = 0; i < 1000; ++i) value.append(std::string(65536, 'x'));
    unsigned long pages = 0;
    std::ifstream("/proc/self/statm") >> pages;
    const rlim_t bytes = rlim_t{pages} * static_cast<rlim_t>(getpagesize()) + (21 << 20);
    const rlimit limit = {bytes, bytes};
    (void)setrlimit(RLIMIT_AS, &limit);
    try {
      (void)toString(value);
    } catch (const std::bad_alloc&) {
      _exit(0);
    }
    _exit(1);
  };
  EXPECT_EXIT(write_with_little_memory(), testing::ExitedWithCode(0), "");
}
#endif

}  // namespace

TEST(JsonTextTest, OneValueIsTheWholeText) {
  Json::Value value;
  for (const char* good : {"{}", " [1] \n", "null", "7", "\"x\"", "{\"a\":\"\xff\xfe raw\"}", "[1 /*c*/]",
                           "[1 /*c*/, 2]", "{/*c*/}", "{/*c*/\"a\":1}", "{\"a\":1 /*c*/, // c\n \"b\":1}"}) {
    EXPECT_TRUE(fromString(value, good)) << good;
  }
  for (const std::string& bad :
       std::vector<std::string>{"", "{}x", "{} {}", "{'a':1}", "[1,]", "// c\n1", "1 // c", "[/*c*/]", "[/*c*/1]",
                                "{\"a\" /*c*/:1}", "{\"a\":/*c*/1}", std::string(2000, '[')}) {
    value = 1;
    EXPECT_FALSE(fromString(value, bad)) << bad;
    EXPECT_TRUE(value.isNull()) << bad;
  }
}

TEST(JsonTextTest, IsOneLineAndKeepsEveryByte) {
  std::string all = "\xc3\xa4";
  for (int byte = 0; byte < 256; ++byte) all += static_cast<char>(byte);
  const std::string text = toString(Json::Value(all));
  EXPECT_EQ(text.find('\n'), std::string::npos);
  EXPECT_EQ(text.substr(0, 3), "\"\xc3\xa4");
  EXPECT_EQ(Parse(text).asString(), all);
}

TEST(JsonFileTest, WritesAndReadsWholeFiles) {
  const test::TempDir dir;
  Json::Value read = 1;
  EXPECT_TRUE(toFile(Parse(R"({"a":[1,{"b":null}]})"), dir / "f"));
  EXPECT_EQ(test::ReadFile(dir / "f"), "{\"a\":[1,{\"b\":null}]}\n");
  EXPECT_TRUE(fromFile(read, dir / "f"));
  EXPECT_EQ(toString(read), "{\"a\":[1,{\"b\":null}]}");
  EXPECT_FALSE(fromFile(read, dir / "missing"));
  EXPECT_TRUE(read.isNull());
  EXPECT_FALSE(toFile(read, dir / "no/such"));
}

TEST(GetJsonValueTest, OptionalOfAnotherTypeKeepsWhatWasThere) {
  EXPECT_EQ(Read<std::string>("[1]"), "\3");
  EXPECT_EQ(Read<std::string>("12"), "12");
  for (const auto& [member, value] : {std::pair{"\"12\"", 3}, {"3000000000", 3}, {"7.9", 7}}) {
    EXPECT_EQ(Read<int>(member), value) << member;
  }
  EXPECT_EQ(Read<unsigned int>("-1"), 3U);
  EXPECT_EQ(Read<unsigned int>("3000000000"), 3000000000U);
  EXPECT_EQ(Read<double>("true"), 1.0);
  // long long takes integers alone, and only those that it can hold.
  EXPECT_EQ(Read<long long>("-5"), -5);
  for (const char* other : {"5.0", "true", "null", "\"5\"", "18446744073709551615"}) {
    EXPECT_EQ(Read<long long>(other), 3) << other;
  }
}

TEST(GetJsonValueTest, FailuresShowTheWholeObjectAlsoInTheLog) {
  const test::LogCapture log;
  EXPECT_EQ(Failure<int>("5", false), "120 Not an object, data=5\n");
  EXPECT_EQ(Failure<int>("null", true), "120 Missing property: k, data=null\n");
  EXPECT_EQ(Failure<int>(R"({"k":"t"})", true), "120 Not a string, data={\n\t\"k\" : \"t\"\n}\n");
  EXPECT_EQ(Failure<long long>(R"({"k":1.0})", true), "120 Not a string, data={\n\t\"k\" : 1.0\n}\n");
  EXPECT_EQ(Failure<Json::Value>(R"({"k":null})", true), "");
  EXPECT_EQ(log.Lines().size(), 4U);
  EXPECT_TRUE(log.Contains("(GetJsonValue) Failed [!obj.isObject()], reason: Not an object, data=5"));
}

TEST(JsonApplyChangesTest, MergesObjectsOnly) {
  struct Row {
    const char *target, *changes, *expected;
  };
  for (const Row& row : {
           Row{R"({"a":1,"b":2})", R"({"a":null,"z":null})", R"({"b":2})"},
           Row{R"({"o":{"x":1,"y":2}})", R"({"o":{"y":3,"n":{"d":1}}})", R"({"o":{"n":{"d":1},"x":1,"y":3}})"},
           Row{R"({"o":5})", R"({"o":{"x":1}})", R"({"o":{"x":1}})"},
           Row{R"({"a":1})", R"([1])", R"({"a":1})"},
       }) {
    Json::Value target = Parse(row.target);
    JsonApplyChanges(target, Parse(row.changes));
    EXPECT_EQ(toString(target), row.expected) << row.target << " + " << row.changes;
  }
}

TEST(JsonArrayTest, ConvertsBothWays) {
  EXPECT_EQ(toString(Vec2JsonArr(std::vector<std::string>{})), "[]");
  EXPECT_EQ(toString(Vec2JsonArr(std::vector<std::string>{"b", "a"})), R"(["b","a"])");
  EXPECT_EQ(JsonArr2Vec<std::string>(Parse(R"(["x",{},[1],7,true])")), (std::vector<std::string>{"x", "7", "true"}));
}

}  // namespace ferrox
