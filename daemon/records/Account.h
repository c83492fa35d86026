// An account as one request sees it.
#pragma once

#include <memory>
#include <string>
#include <utility>

#include "daemon/records/Accounts.h"
#include "daemon/requests/RequestContext.h"
#include "host/RVDAccountStore.h"
#include "host/RVDKeychainManager.h"

namespace records {

// Knows the request that it was handed out for, so that a keychain stores nothing for one that is void.
class Account : public RVAccount {
 public:
  // request: may be null (an account that no request stands behind).
  Account(AccountRecord record, std::shared_ptr<requests::RequestContext> request)
      : record_(std::move(record)),
        request_(std::move(request)),
        accountType_(std::make_shared<const RVAccountType>(record_.accountType)) {}

  std::string identifier() const override { return record_.identifier; }
  std::string description() const override {
    return "account " + record_.identifier + " of " + record_.accountType;
  }
  std::shared_ptr<const RVAccountType> accountType() const override { return accountType_; }
  void setAccountType(std::shared_ptr<const RVAccountType> accountType) override {
    accountType_ = std::move(accountType);
  }
  std::shared_ptr<const RVAccountCredential> credential() const override { return credential_; }
  void setCredential(std::shared_ptr<const RVAccountCredential> credential) override {
    credential_ = std::move(credential);
  }

  const std::shared_ptr<requests::RequestContext>& request() const { return request_; }

 private:
  const AccountRecord record_;
  const std::shared_ptr<requests::RequestContext> request_;
  std::shared_ptr<const RVAccountType> accountType_;
  std::shared_ptr<const RVAccountCredential> credential_;
};

}  // namespace records
