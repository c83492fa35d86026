#include "standin-server/Exchanges.h"

#include <openssl/evp.h>
#include <openssl/rand.h>

#include <array>
#include <nlohmann/json.hpp>
#include <stdexcept>
#include <utility>

namespace standin {
namespace {

using JSON = nlohmann::json;

// What came from outside may be no UTF-8.
std::string text(const JSON& json) {
  return json.dump(-1, ' ', false, JSON::error_handler_t::replace);
}

Answer refusal(int status, const std::string& why) {
  return {status, text(JSON{{"error_msg", why}})};
}

std::string hexadecimal(const unsigned char* bytes, std::size_t size) {
  constexpr std::string_view kDigits = "0123456789abcdef";
  std::string digits;
  for (std::size_t i = 0; i < size; ++i) {
    digits += kDigits[bytes[i] >> 4];
    digits += kDigits[bytes[i] & 15];
  }
  return digits;
}

std::string randomToken() {
  std::array<unsigned char, 32> bytes{};
  if (RAND_bytes(bytes.data(), static_cast<int>(bytes.size())) != 1)
    throw std::runtime_error("no randomness");
  return "standin." + hexadecimal(bytes.data(), bytes.size());
}

std::string parameter(const Question& question, const std::string& name) {
  const auto entry = question.parameters.find(name);
  return entry != question.parameters.end() ? entry->second : std::string();
}

// The names between the commas; none in an empty text.
std::vector<std::string> listed(const std::string& text) {
  std::vector<std::string> names;
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t comma = std::min(text.find(',', start), text.size());
    names.push_back(text.substr(start, comma - start));
    start = comma + 1;
  }
  return names;
}

}  // namespace

std::string hashOfToken(const std::string& token) {
  std::array<unsigned char, EVP_MAX_MD_SIZE> hash{};
  unsigned int size = 0;
  if (EVP_Digest(token.data(), token.size(), hash.data(), &size, EVP_sha256(), nullptr) != 1)
    throw std::runtime_error("no SHA-256");
  return "sha256:" + hexadecimal(hash.data(), 8);
}

Exchanges::Exchanges(Knowledge knowledge)
    : knowledge_(std::move(knowledge)) {
}

Answer Exchanges::answer(const Question& question) {
  const std::lock_guard lock(mutex_);
  if (question.exchange == "whoami") return whoAmI(question);
  if (!isAccount(question.bearerToken)) return refusal(401, "The access token is not valid.");
  seenAccountTokens_.insert(*question.bearerToken);
  if (question.exchange == "describe") return describe(question);
  if (!isApplication(parameter(question, "app_id"))) return refusal(400, "The application is not known.");
  return question.exchange == "authorize" ? authorize(question) : revoke(question);
}

Answer Exchanges::authorize(const Question& question) {
  Issued issued{*question.bearerToken,
                parameter(question, "app_id"),
                parameter(question, "bundle_id"),
                listed(parameter(question, "permissions"))};
  const std::string token = randomToken();
  const JSON body{{"access_token", token}, {"permissions", issued.permissions}};
  issued_.emplace(token, std::move(issued));
  return {200, text(body)};
}

Answer Exchanges::describe(const Question& question) const {
  // The first language of the header, without its region and weight.
  const std::string language =
      question.acceptLanguage.substr(0, question.acceptLanguage.find_first_of("-,; "));
  std::string sentence;
  for (const std::string& permission : listed(parameter(question, "permissions"))) {
    const std::string* description = descriptionOf(permission, language);
    if (description == nullptr) return {200, text("API_EC_PARAM")};
    if (!sentence.empty()) sentence += ", ";
    sentence += *description;
  }
  return {200, text(sentence)};
}

Answer Exchanges::revoke(const Question& question) {
  const std::string appID = parameter(question, "app_id");
  std::size_t count = 0;
  for (auto entry = issued_.begin(); entry != issued_.end();) {
    if (entry->second.accountToken != *question.bearerToken || entry->second.appID != appID) {
      ++entry;
      continue;
    }
    revoked_.insert(entry->first);
    entry = issued_.erase(entry);
    ++count;
  }
  return {200, text(JSON{{"revoked", count}})};
}

Answer Exchanges::whoAmI(const Question& question) const {
  if (question.bearerToken) {
    const auto entry = issued_.find(*question.bearerToken);
    if (entry != issued_.end())
      return {200,
              text(JSON{{"app_id", entry->second.appID},
                        {"bundle_id", entry->second.bundleID},
                        {"permissions", entry->second.permissions}})};
  }
  return refusal(401, "The access token is not valid.");
}

// A token that was issued to an application is none of an account, nor does a revoked one become one.
bool Exchanges::isAccount(const std::optional<std::string>& token) const {
  if (!token || token->empty()) return false;
  if (!knowledge_.accountTokens.empty()) return knowledge_.accountTokens.count(*token) > 0;
  return issued_.count(*token) == 0 && revoked_.count(*token) == 0;
}

bool Exchanges::isApplication(const std::string& appID) const {
  return knowledge_.appIDs.empty() ? !appID.empty() : knowledge_.appIDs.count(appID) > 0;
}

const std::string* Exchanges::descriptionOf(const std::string& permission,
                                            const std::string& language) const {
  for (const std::string& key : {permission + "@" + language, permission}) {
    const auto entry = knowledge_.descriptions.find(key);
    if (entry != knowledge_.descriptions.end()) return &entry->second;
  }
  return nullptr;
}

std::string Exchanges::withoutTokens(std::string text) const {
  const std::lock_guard lock(mutex_);
  const auto replace = [&text](const std::string& token) {
    if (token.empty()) return;
    for (std::size_t at = text.find(token); at != std::string::npos; at = text.find(token, at))
      text.replace(at, token.size(), hashOfToken(token));
  };
  for (const auto& [token, issued] : issued_) replace(token);
  for (const auto* tokens : {&revoked_, &knowledge_.accountTokens, &seenAccountTokens_})
    for (const std::string& token : *tokens) replace(token);
  return text;
}

}  // namespace standin
