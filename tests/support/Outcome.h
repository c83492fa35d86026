// Waiting for the answer of an exchange in a test.
#pragma once

#include <chrono>
#include <future>
#include <memory>
#include <optional>
#include <stdexcept>
#include <string>
#include <thread>
#include <utility>

#include "host/TKFacebookRequests.h"

namespace support {

// What a handler was given, and where.
struct Outcome {
  std::optional<std::string> body;
  std::optional<TKHTTPResponse> response;
  std::optional<RVError> error;
  std::thread::id thread;

  std::string errorText() const {
    return error && error->localizedDescription() ? *error->localizedDescription() : std::string();
  }
};

// The outcome of one exchange. A handler that runs a second time throws; one that is destroyed unused makes
// wait() throw std::future_error.
class PendingOutcome {
 public:
  TKFacebookRequestHandler handler() {
    auto promise = std::make_shared<std::promise<Outcome>>();
    future_ = promise->get_future();
    return [promise = std::move(promise)](const auto& body, const auto& response, const auto& error) {
      promise->set_value({body, response, error, std::this_thread::get_id()});
    };
  }

  bool hasCome() const { return future_.wait_for(std::chrono::seconds(0)) == std::future_status::ready; }

  // Waits for a minute at most.
  Outcome wait() {
    if (future_.wait_for(std::chrono::minutes(1)) != std::future_status::ready)
      throw std::runtime_error("the handler did not run");
    return future_.get();
  }

 private:
  std::future<Outcome> future_;
};

}  // namespace support
