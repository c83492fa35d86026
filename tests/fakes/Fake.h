// What every fake has: a name, a place where its calls are written down, and a hook that may fail them.
#pragma once

#include <cstddef>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace fakes {

// The calls made to a group of fakes, in the order in which they began. Thread-safe.
class CallJournal {
 public:
  // index: how many calls came before this one. call: "<name of the fake>.<method>".
  using Hook = std::function<void(std::size_t index, const std::string& call)>;

  // Runs at the beginning of every call, on the caller's thread; what it throws, the call throws, and
  // nothing else of the call is done.
  void setBeforeCall(Hook hook);

  // With recording off a call costs next to nothing: no call is kept and no hook is run.
  void setRecording(bool recording);

  std::vector<std::string> calls() const;
  // How often this call was made.
  std::size_t count(std::string_view call) const;
  void clear();

  void begin(std::string_view fake, std::string_view method);

 private:
  mutable std::mutex mutex_;
  bool recording_ = true;
  Hook hook_;
  std::vector<std::string> calls_;
};

// The base of the fakes. Calls are written down in a journal of the fake's own until it shares another's.
class Fake {
 public:
  explicit Fake(std::string name);

  // Runs at the beginning of every call with the method's name, on the caller's thread; what it throws,
  // the call throws, and nothing else of the call is done.
  void setBeforeCall(std::function<void(std::string_view method)> hook);

  void shareJournal(std::shared_ptr<CallJournal> journal);
  const std::shared_ptr<CallJournal>& journal() const { return journal_; }

 protected:
  ~Fake() = default;
  void begin(std::string_view method) const;

 private:
  const std::string name_;
  std::shared_ptr<CallJournal> journal_;
  mutable std::mutex hookMutex_;
  std::function<void(std::string_view)> hook_;
};

}  // namespace fakes
