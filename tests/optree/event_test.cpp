// Catches lines of a queue that are read unlike a JSON library reads them.
#include <random>

#include <gtest/gtest.h>

#include "fuzz/event_reference.h"
#include "tests/support/library_test.h"
#include "tests/support/queue_lines.h"

namespace ferrox::test {

namespace {

using fileindex::Event;

TEST(EventTest, ReadsAsTheJsonLibraryDoes) {
  const unsigned seed = std::random_device()();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  const std::string bytes = "\"\\{}[]:, \t0123456789eE.+-truefalsn/\x01\x7f\xff";
  for (const std::string plain : {
           R"({"event":64,"is_dir":false,"path":"/v/s/a b","path_old":"/v","data":null})",
           "\t {\"path\" : \"/a\" ,\r \"event\" : 4294967295 } \n",
           R"({"path":"/b","event":2,"path":"/a"})",
           R"({"event":4294967296,"path":"/a"})",
           R"({"event":true,"path":12.5})",
           R"({"event":null,"path":null})",
           R"({"event":"64","path":["/a"]})",
           R"({"event":64})",
           R"({"path":"/a"})",
           R"({"event":64,"path":"/a","is_dir":"yes","path_old":{},"data":[1,{"a":2}]})",
           R"({"event":64,"path":"/a","is_dir":1,"other":"b"})",
           R"({"event":64,"path":"/\u00e9\n\"\\"})",
           R"({"event":64,"path":"/\ud800"})",
           "{\"event\":64,\"path\":\"/tab\there \xff\xfe \xc3\xa9\"}",
           R"({"event":64,"path":"/a"}/**/ {})",
           "[64]",
           "null",
           "\xef\xbb\xbf{\"event\":64,\"path\":\"/a\"}",
           "",
       }) {
    ASSERT_EQ(Outcome(plain), ReferenceOutcome(plain)) << plain;
    for (int round = 0; round < 2000; ++round) {
      std::string line = plain;
      for (unsigned i = random() % 3 + 1; i > 0; --i) {
        const size_t at = random() % (line.size() + 1);
        line.replace(at, random() % 3, random() % 3, bytes[random() % bytes.size()]);
      }
      ASSERT_EQ(Outcome(line), ReferenceOutcome(line)) << line;
    }
  }
}

TEST(EventTest, MalformedLineIsLoggedAndThrown) {
  const LogCapture log;
  const std::string deep = "{\"event\":64,\"path\":\"/a\",\"data\":" + std::string(5000, '[') + "}";
  const std::string nul("{\"event\":64,\"path\":\"/a\0b\"}", 26);
  const std::string nul_outside("{\"event\":64,\0\"path\":\"/ab\"}", 26);
  const std::string escaped_nul = R"({"event":64,"path":"/a\u0000b"})";
  const std::string in_old = R"({"event":256,"path":"/a","path_old":"\u0000"})";
  const std::string valid = Create("/a");
  const std::string longest = valid + std::string(fileindex::kQueueLineMaxBytes - valid.size(), ' ');
  EXPECT_NO_THROW(Event{longest});
  for (const std::string& line : {std::string("{x"), deep, nul, nul_outside, escaped_nul, in_old, longest + " "}) {
    EXPECT_EQ(FailureOf([&] { Event{line}; }).substr(0, 36), ("906 Malformed event_raw: " + line).substr(0, 36));
  }
  EXPECT_TRUE(LogCapture::Contains(" (Event) Failed [!data.fromString(event_raw)], reason: Malformed event_raw: {x"));
}

}  // namespace

}  // namespace ferrox::test
