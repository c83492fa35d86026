#include "daemon/log/Log.h"

#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <stdexcept>
#include <thread>

namespace {

using logging::DescriptorSink;
using logging::Entry;
using logging::JournalSink;
using logging::Log;
using logging::LogSink;

class KeepingSink final : public LogSink {
 public:
  void write(const Entry& entry) override { entries.push_back(entry); }
  std::vector<Entry> entries;
};

class ThrowingSink final : public LogSink {
 public:
  void write(const Entry&) override { throw std::runtime_error("the disk is full"); }
};

class ALog : public testing::Test {
 protected:
  std::string messageFor(std::string_view format, const std::vector<std::optional<RVValue>>& arguments) {
    log_.RVLog(kRVLogLevelDebug, kRVLogFacilityDaemon, "File", "function", 1, format, arguments);
    return sink_.entries.back().message;
  }

  KeepingSink sink_;
  Log log_{sink_};
};

TEST_F(ALog, HandsOnWhatTheCallerSaysAboutTheLine) {
  log_.RVLog(5, "daemon", "Some/File", "-[Class method:]", 12, "%@ of %d", {"a", 2});
  ASSERT_EQ(sink_.entries.size(), 1u);
  const Entry& entry = sink_.entries.front();
  EXPECT_EQ(entry.level, 5);
  EXPECT_EQ(entry.facility, "daemon");
  EXPECT_EQ(entry.sourceFile, "Some/File");
  EXPECT_EQ(entry.functionName, "-[Class method:]");
  EXPECT_EQ(entry.line, 12);
  EXPECT_EQ(entry.message, "a of 2");
}

TEST_F(ALog, MasksAccessTokens) {
  EXPECT_EQ(messageFor("%@", {RVDictionary{{"access_token", "canary"}}}), R"({"access_token" = "<masked>"})");
}

TEST_F(ALog, LetsNoArgumentForgeALine) {
  EXPECT_EQ(messageFor("by %@.",
                       {"a\nerror: b\r\x1b[2J\xE2\x80\xA8\xE2\x80\xAE"
                        "c"}),
            "by a\\nerror: b\\r\\x1b[2J\\u{2028}\\u{202e}c.");
  EXPECT_EQ(messageFor("%@", {std::string("a\0b", 3)}), "a\\x00b");
}

TEST_F(ALog, ShowsBytesThatAreNoText) {
  EXPECT_EQ(messageFor("%@", {"\xff\xc3"}), "\\xff\\xc3");
}

TEST_F(ALog, KeepsWordsOfAllLanguages) {
  EXPECT_EQ(messageFor("%@", {"Grüße 你好 😀"}), "Grüße 你好 😀");
}

TEST_F(ALog, CutsALongMessageBetweenCharactersAndSaysSo) {
  std::string text = "x";
  for (int i = 0; i < 5000; ++i) text += "ü";
  const std::string message = messageFor("%@", {text});
  EXPECT_TRUE(message.ends_with("ü… (cut, 10001 bytes)"));
  EXPECT_LE(message.size(), Log::kMaximalMessage + 32);
}

TEST_F(ALog, OfTheDaemonsOwnLinesKnowsWhereTheyComeFrom) {
  logging::error(log_, "One %@.", {"thing"});
  const int line = __LINE__ - 1;
  logging::notice(log_, "Two.");
  logging::debug(log_, "Three.");
  ASSERT_EQ(sink_.entries.size(), 3u);
  EXPECT_EQ(sink_.entries[0].level, kRVLogLevelError);
  EXPECT_EQ(sink_.entries[0].message, "One thing.");
  EXPECT_EQ(sink_.entries[0].line, line);
  EXPECT_TRUE(sink_.entries[0].sourceFile.ends_with("log_test.cpp"));
  EXPECT_EQ(sink_.entries[0].facility, "daemon");
  EXPECT_EQ(sink_.entries[1].level, kRVLogLevelNotice);
  EXPECT_EQ(sink_.entries[2].level, kRVLogLevelDebug);
}

TEST(ALogThatCannotWrite, TellsItsCallerNothing) {
  ThrowingSink sink;
  Log log(sink);
  EXPECT_NO_THROW(logging::error(log, "lost"));
}

TEST(AnEntryOfTheJournal, HasTheJournalsFields) {
  const JournalSink sink("rvd");
  EXPECT_EQ(sink.fields({3, "daemon", "Some/File", "-[Class method:]", 12, "It = failed."}),
            (std::vector<std::string>{"MESSAGE=It = failed.",
                                      "PRIORITY=3",
                                      "CODE_FILE=Some/File",
                                      "CODE_FUNC=-[Class method:]",
                                      "CODE_LINE=12",
                                      "SYSLOG_IDENTIFIER=rvd",
                                      "SYSLOG_FACILITY=3"}));
}

class APipe : public testing::Test {
 protected:
  void SetUp() override { ASSERT_EQ(::pipe(ends_.data()), 0); }
  void TearDown() override {
    ::close(ends_[0]);
    if (ends_[1] >= 0) ::close(ends_[1]);
  }
  std::string everythingWritten() {
    ::close(ends_[1]);
    ends_[1] = -1;
    std::string text;
    std::array<char, 4096> chunk{};
    for (ssize_t size = 0; (size = ::read(ends_[0], chunk.data(), chunk.size())) > 0;)
      text.append(chunk.data(), static_cast<std::size_t>(size));
    return text;
  }
  std::array<int, 2> ends_{};
};

TEST_F(APipe, TakesOneLineAnEntry) {
  DescriptorSink sink(ends_[1]);
  sink.write({3, "daemon", "File", "f", 1, "one"});
  sink.write({5, "daemon", "File", "f", 2, "two"});
  sink.write({7, "daemon", "File", "f", 3, "three"});
  EXPECT_EQ(everythingWritten(), "error: one [File:1 f]\nnotice: two [File:2 f]\ndebug: three [File:3 f]\n");
}

TEST_F(APipe, DoesNotMixTheLinesOfSeveralThreads) {
  DescriptorSink sink(ends_[1]);
  Log log(sink);
  std::vector<std::thread> writers;
  for (int writer = 0; writer < 4; ++writer)
    writers.emplace_back([&log] {
      for (int i = 0; i < 100; ++i) log.RVLog(7, "daemon", "F", "f", 1, "%@", {std::string(100, 'x')});
    });
  std::string text;
  std::thread reader([this, &text] {
    std::array<char, 4096> chunk{};
    const std::size_t whole = 400 * (std::string("debug:  [F:1 f]\n").size() + 100);
    while (text.size() < whole) {
      const ssize_t size = ::read(ends_[0], chunk.data(), chunk.size());
      if (size <= 0) return;
      text.append(chunk.data(), static_cast<std::size_t>(size));
    }
  });
  for (std::thread& writer : writers) writer.join();
  ::close(ends_[1]);
  ends_[1] = -1;
  reader.join();
  const std::string line = "debug: " + std::string(100, 'x') + " [F:1 f]\n";
  std::string expected;
  for (int i = 0; i < 400; ++i) expected += line;
  EXPECT_EQ(text, expected);
}

TEST_F(APipe, IsTheJournalsStreamOnlyByItsNumbers) {
  struct stat status {};
  ASSERT_EQ(::fstat(ends_[1], &status), 0);
  const std::string name = std::to_string(status.st_dev) + ":" + std::to_string(status.st_ino);
  EXPECT_TRUE(logging::isJournalStream(name, ends_[1]));
  EXPECT_FALSE(logging::isJournalStream(name + "1", ends_[1]));
  EXPECT_FALSE(logging::isJournalStream("", ends_[1]));
  EXPECT_FALSE(logging::isJournalStream(name, -1));
}

}  // namespace
