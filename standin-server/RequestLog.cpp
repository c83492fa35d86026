#include "standin-server/RequestLog.h"

#include <nlohmann/json.hpp>
#include <stdexcept>

namespace standin {

using JSON = nlohmann::json;

RequestLog::RequestLog(const std::string& path) {
  if (path.empty()) return;
  file_.open(path, std::ios::app);
  if (!file_) throw std::runtime_error("cannot write " + path);
}

void RequestLog::write(const std::string& method,
                       const std::string& path,
                       const Question& question,
                       const Answer& answer,
                       const Exchanges& exchanges) {
  if (!file_.is_open()) return;
  JSON parameters = JSON::object();
  for (const auto& [name, value] : question.parameters)
    parameters[exchanges.withoutTokens(name)] = exchanges.withoutTokens(value);
  JSON line{{"exchange", question.exchange},
            {"method", method},
            {"path", exchanges.withoutTokens(path)},
            {"parameters", parameters},
            {"accept_language", question.acceptLanguage},
            {"token", nullptr},
            {"status", answer.status}};
  if (question.bearerToken) line["token"] = hashOfToken(*question.bearerToken);
  const JSON body = JSON::parse(answer.body, nullptr, false);
  if (body.is_object() && body.contains("access_token") && body["access_token"].is_string())
    line["issued"] = hashOfToken(body["access_token"].get<std::string>());
  const std::lock_guard lock(mutex_);
  file_ << line.dump(-1, ' ', false, JSON::error_handler_t::replace) << std::endl;
}

}  // namespace standin
