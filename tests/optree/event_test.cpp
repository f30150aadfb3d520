#include <cstring>
#include <random>

#include <gtest/gtest.h>

#include "common/error.h"
#include "common/json_util.h"
#include "fuzz/event_reference.h"
#include "tests/support/log_capture.h"
#include "tests/support/queue_lines.h"

namespace ferrox::test {

namespace {

using fileindex::Event;

TEST(EventTest, ReadsAsTheJsonLibraryDoes) {
  const char* const lines[] = {
      R"({"event":64,"path":"/a"})",
      "\t {\"path\" : \"/a\" ,\r \"event\" : 4294967295 } \n",
      R"({"path":"/b","event":2,"path":"/a"})",
      R"({"event":4294967296,"path":"/a"})",
      R"({"event":-1,"path":"/a"})",
      R"({"event":64.0,"path":"/a"})",
      R"({"event":6.5e1,"path":"/a"})",
      R"({"event":064,"path":"/a"})",
      R"({"event":64x,"path":"/a"})",
      R"({"event":true,"path":12.5})",
      R"({"event":null,"path":null})",
      R"({"event":"64","path":"/a"})",
      R"({"event":64,"path":["/a"]})",
      R"({"event":64})",
      R"({"path":"/a"})",
      R"({"event":64,"path":"/a","is_dir":"yes","path_old":{},"data":[1,{"a":2}]})",
      R"({"event":64,"path":"/a","is_dir":1})",
      R"({"event":64,"path":"/a","other":"b"})",
      R"({"event":64,"path":"/\u00e9\n\"\\"})",
      R"({"event":64,"path":"/\ud800"})",
      "{\"event\":64,\"path\":\"/tab\there \xff\xfe \xc3\xa9\"}",
      R"({"event":64,"path":"/a"},)",
      R"({"event":64,"path":"/a",})",
      R"({"event":64,"path":"/a"} {})",
      R"({"event":64,"path":"/a)",
      R"({"event":64 "path":"/a"})",
      R"({"event":64,"path":"/a"}/**/)",
      "[64]",
      "64",
      "null",
      "",
      "\xef\xbb\xbf{\"event\":64,\"path\":\"/a\"}",
  };
  for (const std::string line : lines) {
    EXPECT_EQ(Outcome(line), ReferenceOutcome(line)) << line;
  }
}

TEST(EventTest, MutatedLinesReadAsTheJsonLibraryDoes) {
  const unsigned seed = std::random_device()();
  SCOPED_TRACE("seed " + std::to_string(seed));
  std::mt19937 random(seed);
  const std::string plain = R"({"event":64,"is_dir":false,"path":"/v/s/a b","path_old":"/v","data":null})";
  const std::string bytes = "\"\\{}[]:, \t0123456789eE.+-truefalsn/\x01\x7f\xff";
  for (int round = 0; round < 20000; ++round) {
    std::string line = plain;
    for (unsigned i = random() % 3 + 1; i > 0; --i) {
      const size_t at = random() % line.size();
      line.replace(at, random() % 3, random() % 3, bytes[random() % bytes.size()]);
    }
    ASSERT_EQ(Outcome(line), ReferenceOutcome(line)) << line;
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
    try {
      const Event event(line);
      ADD_FAILURE() << line.substr(0, 60);
    } catch (const Error& error) {
      EXPECT_EQ(error.Code(), Error::kMalformedEvent) << line.substr(0, 60);
      EXPECT_EQ(error.what(), ("Malformed event_raw: " + line).substr(0, strlen(error.what())));
    }
  }
  EXPECT_TRUE(LogCapture::Contains(" (Event) Failed [!data.fromString(event_raw)], reason: Malformed event_raw: {x"));
  EXPECT_EQ(LogCapture::Lines()[0].rfind("optree:", 0), 0u);
}

}  // namespace

}  // namespace ferrox::test
