// Catches failures whose log line names another condition or errno, and texts that could forge a line.
#include "common/log.h"

#include <syslog.h>
#include <unistd.h>

#include <cerrno>

#include "tests/support/library_test.h"

namespace ferrox {

namespace {

void FailWhen(bool bad_thing, int error) {
  errno = error;
  FERROX_FAIL_IF(bad_thing && error >= 0, Error::kInternal, "the reason");
}

}  // namespace

TEST(ErrorTest, ReasonAndComposedText) {
  EXPECT_STREQ(Error(Error::kInternal).std::runtime_error::what(), "Ferrox error, code=502");
  const Error copy = Error(Error::kBadArgument, "x");
  EXPECT_EQ(copy.Code(), 120);
  EXPECT_STREQ(copy.what(), "x");
  EXPECT_STREQ(copy.std::runtime_error::what(), "Ferrox error, code=120, reason=[x]");
}

TEST(FailTest, LogsConditionReasonAndErrnoThenThrows) {
  const test::LogCapture log;
  EXPECT_NO_THROW(FailWhen(false, 0));
  EXPECT_THROW(FailWhen(true, 0), Error);
  EXPECT_THROW(FailWhen(true, ENOENT), Error);
  EXPECT_EQ(errno, ENOENT) << "errno is as it was at the check";
  ASSERT_EQ(log.Lines().size(), 2U);
  EXPECT_EQ(log.Lines()[0].rfind("log_test:", 0), 0U) << log.Lines()[0];
  const std::string line = " (" + std::to_string(getpid()) + ", " + std::to_string(geteuid()) +
                           ") (FailWhen) Failed [bad_thing && error >= 0], reason: the reason";
  EXPECT_EQ(log.Lines()[0].substr(log.Lines()[0].find(' ')), line);
  EXPECT_EQ(log.Lines()[1].substr(log.Lines()[1].find(' ')), line + " [err: No such file or directory]");
}

TEST(LogTest, NoTextCanForgeALine) {
  const test::LogCapture log;
  Log(LOG_ERR, "name=%s", "a\nb\x1b[2J\x7f\xc2\x9b\xe2\x80\xae\xff %s \xc3\xa4");
  Log(LOG_ERR, "%s", std::string(20000, 'x').c_str());
  EXPECT_EQ(log.Lines()[0], "name=a\\x0ab\\x1b[2J\\x7f\\xc2\\x9b\\xe2\\x80\\xae\\xff %s \xc3\xa4");
  EXPECT_EQ(log.Lines()[1].size(), 8191U);
}

}  // namespace ferrox
