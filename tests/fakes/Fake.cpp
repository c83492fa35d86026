#include "tests/fakes/Fake.h"

#include <algorithm>
#include <utility>

namespace fakes {

void CallJournal::setBeforeCall(Hook hook) {
  const std::lock_guard lock(mutex_);
  hook_ = std::move(hook);
}

void CallJournal::setRecording(bool recording) {
  const std::lock_guard lock(mutex_);
  recording_ = recording;
}

std::vector<std::string> CallJournal::calls() const {
  const std::lock_guard lock(mutex_);
  return calls_;
}

std::size_t CallJournal::count(std::string_view call) const {
  const std::lock_guard lock(mutex_);
  return static_cast<std::size_t>(std::count(calls_.begin(), calls_.end(), call));
}

void CallJournal::clear() {
  const std::lock_guard lock(mutex_);
  calls_.clear();
}

void CallJournal::begin(std::string_view fake, std::string_view method) {
  Hook hook;
  std::size_t index = 0;
  std::string call;
  {
    const std::lock_guard lock(mutex_);
    if (!recording_) return;
    call = std::string(fake) + "." + std::string(method);
    index = calls_.size();
    calls_.push_back(call);
    hook = hook_;
  }
  if (hook) hook(index, call);
}

Fake::Fake(std::string name)
    : name_(std::move(name)),
      journal_(std::make_shared<CallJournal>()) {
}

void Fake::setBeforeCall(std::function<void(std::string_view)> hook) {
  const std::lock_guard lock(hookMutex_);
  hook_ = std::move(hook);
}

void Fake::shareJournal(std::shared_ptr<CallJournal> journal) {
  journal_ = std::move(journal);
}

void Fake::begin(std::string_view method) const {
  journal_->begin(name_, method);
  std::function<void(std::string_view)> hook;
  {
    const std::lock_guard lock(hookMutex_);
    hook = hook_;
  }
  if (hook) hook(method);
}

}  // namespace fakes
