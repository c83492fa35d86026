// A server that answers as it was told to.
#pragma once

#include <condition_variable>
#include <deque>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "host/TKFacebookRequests.h"
#include "tests/fakes/Fake.h"

namespace fakes {

// How one exchange ends.
struct FakeReply {
  enum class Delivery {
    kOtherThread,  // the handler runs on the fake's own thread
    kHeld,         // as above, once the test lets it go
    kDropped,      // the handler is destroyed unused, on the fake's own thread
    kThrown,       // performRequestWithHandler throws std::runtime_error
  };

  std::optional<std::string> body;
  std::optional<TKHTTPResponse> response;
  std::optional<RVError> error;
  Delivery delivery = Delivery::kOtherThread;

  static FakeReply withBody(std::string body, int statusCode = 200);
  static FakeReply withError(RVError error);
  static FakeReply withoutAnything();
  static FakeReply dropped();
  static FakeReply thrown();
  FakeReply held() const;
};

// One exchange as it was started, or only prepared.
struct FakeAuthorizationExchange {
  std::string appId;
  std::string bundleId;
  std::optional<RVPermissionSet> permissions;
  std::optional<std::string> audience;
  bool tokenWasSet = false;
  std::optional<RVSecret> accessToken;
  bool performed = false;
};

struct FakeDescriptionExchange {
  RVPermissionSet permissions;
  std::optional<std::string> audience;
  bool tokenWasSet = false;
  std::optional<RVSecret> accessToken;
  bool performed = false;
};

class FakeFacebookRequests final : public TKFacebookRequestFactory, public Fake {
 public:
  // Authorizations are answered with the token "client-token" and "permissions": [], descriptions with
  // "do something new", until the test says otherwise.
  FakeFacebookRequests();
  // Drops the handlers that are still held and ends the thread.
  ~FakeFacebookRequests();

  std::shared_ptr<TKFacebookAuthorizationRequest> initWithAppId(
      const std::string& appId,
      const std::string& bundleId,
      const std::optional<RVPermissionSet>& permissions,
      const std::optional<std::string>& audience) override;
  std::shared_ptr<TKFacebookPermissionDescriptionRequest> initWithPermissions(
      const RVPermissionSet& permissions,
      const std::optional<std::string>& audience) override;
  std::shared_ptr<TKFacebookSession> initSession() override;

  // The replies to the coming exchanges, in order; the last one is given again and again.
  void replyToAuthorizations(std::vector<FakeReply> replies);
  void replyToDescriptions(std::vector<FakeReply> replies);

  // Waits until this many exchanges are held, for half a minute at most; returns whether they are.
  [[nodiscard]] bool waitForHeld(std::size_t count);
  // Gives the held exchanges their replies, in the order in which they were started.
  void releaseHeld();
  // Destroys their handlers unused.
  void dropHeld();
  // Returns when every handler that was let go has run and is destroyed. Not from a handler.
  void waitUntilDelivered();

  std::vector<FakeAuthorizationExchange> authorizations() const;
  std::vector<FakeDescriptionExchange> descriptions() const;
  std::size_t sessionsMade() const;
  std::vector<std::string> revokedAppIDs() const;
  // What handlers threw, which reaches nobody else.
  std::size_t handlerExceptions() const;

 private:
  class Authorization;
  class Description;
  class Session;
  struct Delivery {
    FakeReply reply;
    TKFacebookRequestHandler handler;
  };

  void perform(std::deque<FakeReply>& replies, TKFacebookRequestHandler handler);
  void deliverAll();

  mutable std::mutex mutex_;
  std::condition_variable changed_;
  std::deque<FakeReply> authorizationReplies_;
  std::deque<FakeReply> descriptionReplies_;
  std::vector<std::shared_ptr<FakeAuthorizationExchange>> authorizations_;
  std::vector<std::shared_ptr<FakeDescriptionExchange>> descriptions_;
  std::size_t sessionsMade_ = 0;
  std::vector<std::string> revokedAppIDs_;
  std::size_t handlerExceptions_ = 0;
  std::deque<Delivery> held_;
  std::deque<Delivery> due_;
  bool delivering_ = false;
  bool ending_ = false;
  std::thread thread_;
};

}  // namespace fakes
