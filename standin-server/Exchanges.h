// What the stand-in server knows and says: accounts, applications, issued tokens, descriptions.
#pragma once

#include <map>
#include <mutex>
#include <optional>
#include <set>
#include <string>
#include <vector>

namespace standin {

// Who may ask for what.
struct Knowledge {
  std::set<std::string> accountTokens;  // empty: any token that was not issued here is an account's
  std::set<std::string> appIDs;         // empty: any app ID that is not empty
  // Permission names and their descriptions; "name@de" holds the German one.
  std::map<std::string, std::string> descriptions;
};

// One request, already taken apart.
struct Question {
  std::string exchange;  // "authorize", "describe", "revoke" or "whoami"
  std::optional<std::string> bearerToken;
  std::map<std::string, std::string> parameters;
  std::string acceptLanguage;
};

struct Answer {
  int status = 200;
  std::string body;  // JSON
};

// Answers as the server would. Thread-safe.
class Exchanges {
 public:
  explicit Exchanges(Knowledge knowledge);

  Answer answer(const Question& question);

  // The text with every known token in it replaced by its hash.
  std::string withoutTokens(std::string text) const;

 private:
  struct Issued {
    std::string accountToken;
    std::string appID;
    std::string bundleID;
    std::vector<std::string> permissions;
  };

  Answer authorize(const Question& question);
  Answer describe(const Question& question) const;
  Answer revoke(const Question& question);
  Answer whoAmI(const Question& question) const;
  bool isAccount(const std::optional<std::string>& token) const;
  bool isApplication(const std::string& appID) const;
  const std::string* descriptionOf(const std::string& permission, const std::string& language) const;

  const Knowledge knowledge_;
  mutable std::mutex mutex_;
  std::map<std::string, Issued> issued_;  // by token
  std::set<std::string> revoked_;
  std::set<std::string> seenAccountTokens_;
};

// "sha256:" and the first 16 hexadecimal digits of the token's hash: tells tokens apart, and is none.
std::string hashOfToken(const std::string& token);

}  // namespace standin
