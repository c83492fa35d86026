// What every log must do, held against the daemon's own and the one that the tests use in its place.
#include <gtest/gtest.h>

#include <functional>
#include <memory>
#include <mutex>
#include <thread>

#include "daemon/log/Log.h"
#include "tests/fakes/FakeTexts.h"

namespace {

struct Line {
  int level;
  std::string facility;
  std::string sourceFile;
  std::string functionName;
  int line;
  std::string text;
  friend bool operator==(const Line&, const Line&) = default;
};

// One log, and what came out of it.
class Subject {
 public:
  virtual ~Subject() = default;
  virtual RVLogService& log() = 0;
  virtual std::vector<Line> lines() = 0;
};

class FakeSubject final : public Subject {
 public:
  RVLogService& log() override { return log_; }
  std::vector<Line> lines() override {
    std::vector<Line> lines;
    for (const auto& line : log_.lines())
      lines.push_back({line.level, line.facility, line.sourceFile, line.functionName, line.line, line.text});
    return lines;
  }

 private:
  fakes::FakeLog log_;
};

class DaemonSubject final : public Subject {
 public:
  RVLogService& log() override { return log_; }
  std::vector<Line> lines() override { return sink_.lines; }

 private:
  class Sink final : public logging::LogSink {
   public:
    void write(const logging::Entry& entry) override {
      const std::lock_guard lock(mutex);
      lines.push_back(
          {entry.level, entry.facility, entry.sourceFile, entry.functionName, entry.line, entry.message});
    }
    std::mutex mutex;
    std::vector<Line> lines;
  };
  Sink sink_;
  logging::Log log_{sink_};
};

struct Kind {
  std::string name;
  std::function<std::unique_ptr<Subject>()> make;
};

class EveryLog : public testing::TestWithParam<Kind> {
 protected:
  RVLogService& log() { return subject_->log(); }
  std::string textOf(std::string_view format, const std::vector<std::optional<RVValue>>& arguments) {
    log().RVLog(kRVLogLevelDebug, kRVLogFacilityDaemon, "File", "function", 1, format, arguments);
    return subject_->lines().back().text;
  }
  const std::unique_ptr<Subject> subject_ = GetParam().make();
};

INSTANTIATE_TEST_SUITE_P(OfBothKinds,
                         EveryLog,
                         testing::Values(Kind{"Fake", [] { return std::make_unique<FakeSubject>(); }},
                                         Kind{"Daemon", [] { return std::make_unique<DaemonSubject>(); }}),
                         [](const auto& kind) { return kind.param.name; });

TEST_P(EveryLog, WritesWhatItIsGivenInOrder) {
  log().RVLog(7, "daemon", "A/File", "-[Class one:]", 1, "first", {});
  log().RVLog(3, "daemon", "Another", "two", 2, "second", {});
  EXPECT_EQ(subject_->lines(),
            (std::vector<Line>{{7, "daemon", "A/File", "-[Class one:]", 1, "first"},
                               {3, "daemon", "Another", "two", 2, "second"}}));
}

TEST_P(EveryLog, FillsTheFormatAndNeverScansAnArgument) {
  EXPECT_EQ(textOf("%@ has %d of %@ %%", {"%@", 3, std::nullopt}), "%@ has 3 of (null) %");
}

TEST_P(EveryLog, MasksTheMembersNamedAccessToken) {
  const std::string text =
      textOf("Access request response: %@",
             {RVDictionary{{"access_token", "canary"},
                           {"data", RVArray{RVDictionary{{"access_token", "canary"}}}}}});
  EXPECT_EQ(text.find("canary"), std::string::npos);
  EXPECT_NE(text.find("access_token"), std::string::npos);
}

TEST_P(EveryLog, TakesLinesFromManyThreads) {
  std::vector<std::thread> threads;
  for (int i = 0; i < 4; ++i)
    threads.emplace_back([this] {
      for (int round = 0; round < 100; ++round) log().RVLog(7, "daemon", "F", "f", round, "%d", {round});
    });
  for (std::thread& thread : threads) thread.join();
  const auto lines = subject_->lines();
  EXPECT_EQ(lines.size(), 400u);
  for (const Line& line : lines) EXPECT_EQ(line.text, std::to_string(line.line));
}

}  // namespace
