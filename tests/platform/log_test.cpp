// Where log lines go, as a host sees it.
#include <gtest/gtest.h>

#include <string>

#include "Voice_Engine/platform/log.h"
#include "jni/orvalis.h"

namespace {

using orvalis::kLogTag;
using orvalis::log_line;

TEST(Log, GoesToTheSinkAndWithoutOneProblemsToStandardError) {
  const auto lines_of = [](const std::string &text) {
    testing::internal::CaptureStderr();
    log_line(orvalis::kLogDebug, kLogTag, "%s", text.c_str());
    log_line(orvalis::kLogInfo, kLogTag, "%d", 4);
    log_line(orvalis::kLogWarning, kLogTag, "%d", 5);
    log_line(orvalis::kLogError, kLogTag, "six");
    return testing::internal::GetCapturedStderr();
  };
  SetLogSink(nullptr, nullptr);
  EXPECT_EQ(lines_of("one"), "W/Orvalis: 5\nE/Orvalis: six\n");
  SetLogSink(LogNothing, nullptr);
  EXPECT_EQ(lines_of("one"), "");
  SetLogSink(LogAllToStandardError, nullptr);
  EXPECT_EQ(lines_of("one"), "D/Orvalis: one\nI/Orvalis: 4\nW/Orvalis: 5\nE/Orvalis: six\n");
  const std::string endless(1000, 'x');
  EXPECT_EQ(lines_of(endless).find('\n'), std::string("D/Orvalis: ").size() + 255)
      << "truncated, not lost";

  std::string received;
  SetLogSink(
      [](int priority, const char *tag, const char *text, void *user) {
        *static_cast<std::string *>(user) += std::to_string(priority) + tag + text + ";";
      },
      &received);
  EXPECT_EQ(lines_of("one"), "");
  EXPECT_EQ(received, "3Orvalisone;4Orvalis4;5Orvalis5;6Orvalissix;");
  SetLogSink(nullptr, nullptr);
  EXPECT_NE(lines_of("one"), "") << "a null sink restores the default";
}

}  // namespace
