// A credential store in memory, which fails as a test wants it to.
#pragma once

#include <map>
#include <memory>
#include <mutex>
#include <optional>
#include <utility>
#include <vector>

#include "daemon/credentials/CredentialStore.h"

namespace support {

class MemoryStore final : public credentials::CredentialStore {
 public:
  using Place = credentials::Place;
  using Credentials = std::map<Place, RVAccountCredential>;

  // credentials: what it holds; it may outlive the store.
  explicit MemoryStore(std::shared_ptr<Credentials> credentials = std::make_shared<Credentials>())
      : credentials_(std::move(credentials)) {}

  base::Result<std::optional<RVAccountCredential>> read(const Place& place) override {
    const std::lock_guard lock(mutex_);
    if (fails()) return failure_;
    const auto found = credentials_->find(place);
    if (found == credentials_->end()) return std::optional<RVAccountCredential>();
    return std::optional(found->second);
  }
  base::Result<void> write(const Place& place, const RVAccountCredential& credential) override {
    return change([&] { credentials_->insert_or_assign(place, credential); });
  }
  base::Result<void> remove(const Place& place) override {
    return change([&] { credentials_->erase(place); });
  }
  base::Result<std::vector<Place>> places() override {
    const std::lock_guard lock(mutex_);
    if (fails()) return failure_;
    std::vector<Place> places;
    for (const auto& [place, credential] : *credentials_) places.push_back(place);
    return places;
  }

  // Has every call fail, or none.
  void setFailing(bool isFailing) {
    const std::lock_guard lock(mutex_);
    isFailing_ = isFailing;
  }

  // Has the call of that number (from 1), and all after it, fail. isDone: the first of them does all the same
  // what it was asked for.
  void failFrom(int number, bool isDone) {
    const std::lock_guard lock(mutex_);
    callsToFailure_ = number;
    isDoneWhereItFails_ = isDone;
  }

  // Whether failFrom has come true.
  bool hasFailed() const { return isFailing_; }

 private:
  bool fails() {
    if (--callsToFailure_ == 0) isFailing_ = true;
    return isFailing_;
  }
  template <typename Change>
  base::Result<void> change(const Change& change) {
    const std::lock_guard lock(mutex_);
    const bool isFailing = fails();
    if (!isFailing || (callsToFailure_ == 0 && isDoneWhereItFails_)) change();
    if (isFailing) return failure_;
    return {};
  }

  const base::Failure failure_{base::FailureKind::kFailed, "the store is gone"};
  const std::shared_ptr<Credentials> credentials_;
  std::mutex mutex_;
  bool isFailing_ = false;
  int callsToFailure_ = 0;
  bool isDoneWhereItFails_ = false;
};

}  // namespace support
