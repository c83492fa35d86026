// The services that deal in text: string table, JSON reader, log and access log.
#pragma once

#include <map>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "host/JSONReader.h"
#include "host/RVLog.h"
#include "host/RVStringTable.h"
#include "tests/fakes/Fake.h"

namespace fakes {

// A table that holds what the test puts in. A key that is not in it reads as the default value or, where
// that is empty, as itself.
class FakeStringTable final : public RVStringTable, public Fake {
 public:
  struct Lookup {
    std::string key;
    std::string value;
    std::string table;
  };

  FakeStringTable();

  std::optional<std::string> textForKey(std::string_view key,
                                        std::string_view value,
                                        std::string_view table) override;
  std::string stringWithFormat(std::string_view format,
                               const std::vector<std::optional<RVValue>>& arguments) const override;

  void put(std::string_view key, std::string_view text);
  // From now on nothing can be looked up at all.
  void setUnavailable(bool unavailable = true);

  std::vector<Lookup> lookups() const;

 private:
  mutable std::mutex mutex_;
  std::map<std::string, std::string, std::less<>> texts_;
  bool unavailable_ = false;
  std::vector<Lookup> lookups_;
};

// Reads as the daemon's own reader does, until it is told otherwise.
class FakeJSONReader final : public RVJSONReader, public Fake {
 public:
  FakeJSONReader();
  RVJSONResult objectWithData(std::string_view data) override;

  // From now on every document reads as this; absent: they are read again.
  void readEverythingAs(std::optional<RVJSONResult> result);

 private:
  mutable std::mutex mutex_;
  std::optional<RVJSONResult> fixed_;
};

class FakeLog final : public RVLogService, public Fake {
 public:
  struct Line {
    int level = 0;
    std::string facility;
    std::string sourceFile;
    std::string functionName;
    int line = 0;
    std::string format;
    std::vector<std::optional<RVValue>> arguments;
    std::string text;  // the format filled with the arguments, tokens masked
  };

  FakeLog();
  void RVLog(int level,
             std::string_view facility,
             std::string_view sourceFile,
             std::string_view functionName,
             int line,
             std::string_view format,
             const std::vector<std::optional<RVValue>>& arguments) override;

  // From now on lines are taken and thrown away.
  void setSilent(bool silent = true);

  std::vector<Line> lines() const;
  // The texts of the lines alone.
  std::vector<std::string> texts() const;
  void clear();

 private:
  mutable std::mutex mutex_;
  bool silent_ = false;
  std::vector<Line> lines_;
};

class FakeAccessLog final : public RVDAccessLog, public Fake {
 public:
  struct Entry {
    std::string accountTypeIdentifier;
    std::optional<std::string> clientID;
    bool granted = false;
    bool requested = false;
    double elapsed = -1;

    friend bool operator==(const Entry&, const Entry&) = default;
  };

  FakeAccessLog();
  void RVDLogAccessRequest(std::string_view accountTypeIdentifier,
                           const std::optional<std::string>& clientID,
                           bool granted,
                           bool requested,
                           double elapsed) override;

  std::vector<Entry> entries() const;

 private:
  mutable std::mutex mutex_;
  std::vector<Entry> entries_;
};

}  // namespace fakes
