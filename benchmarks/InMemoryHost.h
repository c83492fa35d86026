// A host with nothing behind it: records in a field, a log that does nothing, answers that come at
// once. What is measured over it is the plug-in alone.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "host/RVDAccountAccessPlugin.h"

namespace benchmarks {

class Client final : public RVDClient {
 public:
  std::optional<std::string> bundleID() const override { return "org.example.Photos"; }
  std::string localizedAppName() const override { return "Photos"; }
  bool hasEntitlement(std::string_view) const override { return false; }
  std::string description() const override { return "org.example.Photos"; }
};

class Account final : public RVAccount {
 public:
  std::string identifier() const override { return "1"; }
  std::string description() const override { return "somebody"; }
  std::shared_ptr<const RVAccountType> accountType() const override { return accountType_; }
  void setAccountType(std::shared_ptr<const RVAccountType> accountType) override {
    accountType_ = std::move(accountType);
  }
  std::shared_ptr<const RVAccountCredential> credential() const override { return credential_; }
  void setCredential(std::shared_ptr<const RVAccountCredential> credential) override {
    credential_ = std::move(credential);
  }

 private:
  std::shared_ptr<const RVAccountType> accountType_;
  std::shared_ptr<const RVAccountCredential> credential_;
};

// Holds one record, or none.
class Store final : public RVDAccountStore, RVDAuthorizationManager {
 public:
  std::vector<std::shared_ptr<RVAccount>> accountsWithAccountTypeIdentifier(std::string_view) override {
    return {std::make_shared<Account>()};
  }
  RVDAuthorizationManager& authorizationManager() override { return *this; }
  void forget() { record_.reset(); }

 private:
  std::optional<RVDClientAuthorization> authorizationForClient(const RVDClient&,
                                                               const RVAccountType&) override {
    return record_;
  }
  std::vector<RVDClientAuthorization> allAuthorizationsForAccountType(const RVAccountType&) override {
    return {};
  }
  std::optional<RVError> setAuthorization(const RVDClientAuthorization& authorization,
                                          const RVDClient&,
                                          const RVAccountType&) override {
    record_ = authorization;
    return std::nullopt;
  }
  void removeAllClientAuthorizationsForAccountType(const RVAccountType&) override { record_.reset(); }

  std::optional<RVDClientAuthorization> record_;
};

// Everything else that the plug-in is given. The server grants what it is asked for, the user allows.
class Services final : RVDKeychainManager,
                       TKFacebookRequestFactory,
                       ZQUserNotificationService,
                       ZQPreferences,
                       ZQSerialQueueFactory,
                       ZQNotificationCenter,
                       RVJSONReader,
                       RVLogService,
                       RVDAccessLog {
 public:
  RVDHostServices with(RVStringTable& table) {
    return {this, this, this, this, this, this, this, &table, this, this};
  }

  RVLogService& log() { return *this; }

 private:
  class Request final : public TKFacebookAuthorizationRequest, public TKFacebookPermissionDescriptionRequest {
   public:
    void setAccessToken(std::optional<RVSecret>) override {}
    void performRequestWithHandler(TKFacebookRequestHandler handler) override {
      handler("answer", TKHTTPResponse{200}, std::nullopt);
    }
  };
  class Session final : public TKFacebookSession {
    void revokeAccessTokenForAppWithID(const std::string&) override {}
  };
  class Queue final : public ZQSerialQueue {
   public:
    const std::string& label() const override { return label_; }
    void dispatchSync(const std::function<void()>& work) override { work(); }
    void dispatchAsync(std::function<void()> work) override { work(); }

   private:
    const std::string label_ = "benchmark";
  };

  std::shared_ptr<const RVAccountCredential> credentialForAccount(
      const RVAccount&,
      const std::optional<std::string>&) override {
    return nullptr;
  }
  std::optional<RVError> setCredentialForAccount(const RVAccount&,
                                                 const std::optional<std::string>&) override {
    return std::nullopt;
  }
  std::optional<RVError> removeCredentialForAccount(const RVAccount&,
                                                    const std::optional<std::string>&) override {
    return std::nullopt;
  }
  std::shared_ptr<TKFacebookAuthorizationRequest> initWithAppId(const std::string&,
                                                                const std::string&,
                                                                const std::optional<RVPermissionSet>&,
                                                                const std::optional<std::string>&) override {
    return std::make_shared<Request>();
  }
  std::shared_ptr<TKFacebookPermissionDescriptionRequest> initWithPermissions(
      const RVPermissionSet&,
      const std::optional<std::string>&) override {
    return std::make_shared<Request>();
  }
  std::shared_ptr<TKFacebookSession> initSession() override { return std::make_shared<Session>(); }
  ZQUserNotificationRef ZQUserNotificationCreate(const ZQAllocator*,
                                                 double,
                                                 unsigned long,
                                                 int*,
                                                 const RVDictionary&) override {
    return nullptr;
  }
  int ZQUserNotificationReceiveResponse(ZQUserNotificationRef, double, ZQResponseFlags* flags) override {
    *flags = 0;
    return 0;
  }
  void ZQRelease(ZQUserNotificationRef) override {}
  std::optional<RVValue> ZQPreferencesCopyValue(std::string_view,
                                                std::string_view,
                                                ZQPreferencesUser,
                                                ZQPreferencesHost) override {
    return std::nullopt;
  }
  bool ZQPreferencesAppSynchronize(std::string_view) override { return true; }
  bool booleanValue(const RVValue&) const override { return false; }
  std::shared_ptr<ZQSerialQueue> createSerialQueue(std::string_view) override {
    return std::make_shared<Queue>();
  }
  int registerForNotification(std::string_view,
                              std::shared_ptr<ZQSerialQueue>,
                              std::function<void()>) override {
    return 1;
  }
  RVJSONResult objectWithData(std::string_view) override { return {answer_, std::nullopt}; }
  void RVLog(int,
             std::string_view,
             std::string_view,
             std::string_view,
             int,
             std::string_view,
             const std::vector<std::optional<RVValue>>&) override {}
  void RVDLogAccessRequest(std::string_view, const std::optional<std::string>&, bool, bool, double) override {
  }

  const RVValue answer_ = RVDictionary{{"access_token", "token"},
                                       {"permissions", RVArray{"email", "user_photos", "publish_stream"}}};
};

}  // namespace benchmarks
