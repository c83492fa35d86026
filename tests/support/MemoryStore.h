// A credential store in memory, which fails as a test wants it to.
#pragma once

#include <map>
#include <mutex>
#include <optional>
#include <vector>

#include "daemon/credentials/CredentialStore.h"

namespace support {

class MemoryStore final : public credentials::CredentialStore {
 public:
  using Place = credentials::Place;

  base::Result<std::optional<RVAccountCredential>> read(const Place& place) override {
    const std::lock_guard lock(mutex_);
    if (fails()) return failure_;
    const auto found = credentials_.find(place);
    if (found == credentials_.end()) return std::optional<RVAccountCredential>();
    return std::optional(found->second);
  }
  base::Result<void> write(const Place& place, const RVAccountCredential& credential) override {
    const std::lock_guard lock(mutex_);
    const bool isFailing = fails();
    if (!isFailing || isDoneWhereItFails_) credentials_.insert_or_assign(place, credential);
    if (isFailing) return failure_;
    return {};
  }
  base::Result<void> remove(const Place& place) override {
    const std::lock_guard lock(mutex_);
    const bool isFailing = fails();
    if (!isFailing || isDoneWhereItFails_) credentials_.erase(place);
    if (isFailing) return failure_;
    return {};
  }
  base::Result<std::vector<Place>> places() override {
    const std::lock_guard lock(mutex_);
    if (fails()) return failure_;
    std::vector<Place> places;
    for (const auto& [place, credential] : credentials_) places.push_back(place);
    return places;
  }

  // Has every call fail, or none.
  void setFailing(bool isFailing) {
    const std::lock_guard lock(mutex_);
    isFailing_ = isFailing;
  }
  // Has one call fail: the `number`th from now on, from 1. isDone: it does what it was asked for all the
  // same.
  void failAt(int number, bool isDone) {
    const std::lock_guard lock(mutex_);
    callsToFailure_ = number;
    isDoneWhereItFails_ = isDone;
  }
  const std::map<Place, RVAccountCredential>& credentials() const { return credentials_; }

 private:
  bool fails() { return isFailing_ || --callsToFailure_ == 0; }

  const base::Failure failure_{base::FailureKind::kFailed, "the store is gone"};
  std::mutex mutex_;
  std::map<Place, RVAccountCredential> credentials_;
  bool isFailing_ = false;
  int callsToFailure_ = 0;
  bool isDoneWhereItFails_ = false;
};

}  // namespace support
