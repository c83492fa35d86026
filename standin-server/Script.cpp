#include "standin-server/Script.h"

#include <algorithm>
#include <functional>
#include <nlohmann/json.hpp>
#include <stdexcept>
#include <utility>

namespace standin {
namespace {

using JSON = nlohmann::json;

std::chrono::milliseconds duration(const JSON& value) {
  const auto count = value.get<std::int64_t>();
  if (count < 0 || count > 3'600'000) throw std::runtime_error("a time is out of range (0 to 3600000 ms)");
  return std::chrono::milliseconds(count);
}

ScriptedAnswer::Drop drop(const JSON& value) {
  const auto name = value.get<std::string>();
  if (name == "before-headers") return ScriptedAnswer::Drop::kBeforeHeaders;
  if (name == "after-headers") return ScriptedAnswer::Drop::kAfterHeaders;
  if (name == "mid-body") return ScriptedAnswer::Drop::kMidBody;
  throw std::runtime_error("\"drop\" is none of before-headers, after-headers, mid-body");
}

void setMember(ScriptedAnswer& answer, const std::string& key, const JSON& value) {
  if (key == "exchange") {
    answer.exchange = value.get<std::string>();
  } else if (key == "delay_ms") {
    answer.delay = duration(value);
  } else if (key == "status") {
    answer.status = value.get<int>();
    if (answer.status < 200 || answer.status > 599) throw std::runtime_error("\"status\" is not 200 to 599");
  } else if (key == "headers") {
    for (const auto& [name, text] : value.items()) answer.headers.emplace(name, text.get<std::string>());
  } else if (key == "body") {
    answer.body = value.is_string() ? value.get<std::string>() : value.dump();
  } else if (key == "drop") {
    answer.drop = drop(value);
  } else if (key == "endless") {
    answer.isEndless = value.get<bool>();
  } else if (key == "slow_ms") {
    answer.pause = duration(value);
  } else {
    throw std::runtime_error("the key \"" + key + "\" is not known");
  }
  if (key != "exchange" && key != "delay_ms") answer.replacesAnswer = true;
}

}  // namespace

Script::Script(const std::string& text) {
  std::size_t number = 1;
  try {
    const JSON script = JSON::parse(text);
    if (!script.is_array()) throw std::runtime_error("it is not a list of answers");
    for (const JSON& entry : script) {
      if (!entry.is_object()) throw std::runtime_error("it is not an object");
      ScriptedAnswer answer;
      for (const auto& [key, value] : entry.items()) setMember(answer, key, value);
      if (answer.isEndless && answer.body.empty()) answer.body = std::string(4096, 'x');
      answers_.push_back(std::move(answer));
      ++number;
    }
  } catch (const std::exception& exception) {
    throw std::runtime_error("answer " + std::to_string(number) + " of the script: " + exception.what());
  }
}

std::optional<ScriptedAnswer> Script::takeFor(const std::string& exchange) {
  const std::lock_guard lock(mutex_);
  const auto fits = [&exchange](const ScriptedAnswer& answer) {
    return !answer.exchange || *answer.exchange == exchange;
  };
  const auto entry = std::find_if(answers_.begin(), answers_.end(), fits);
  if (entry == answers_.end()) return std::nullopt;
  ScriptedAnswer answer = std::move(*entry);
  answers_.erase(entry);
  return answer;
}

}  // namespace standin
