#include <cstdint>
#include <limits>
#include <nlohmann/json.hpp>
#include <set>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

#include "tests/fakes/FakeTexts.h"

namespace fakes {
namespace {

constexpr std::size_t kMaximumSize = 1 << 20;
constexpr int kMaximumDepth = 64;

struct Unacceptable : std::runtime_error {
  using std::runtime_error::runtime_error;
};

// Refuses what the parser itself would take: repeated keys, and nesting without end.
class Strictness {
 public:
  bool operator()(int depth, nlohmann::json::parse_event_t event, nlohmann::json& parsed) {
    using Event = nlohmann::json::parse_event_t;
    if (event == Event::object_start || event == Event::array_start) {
      if (depth >= kMaximumDepth) throw Unacceptable("The document is nested too deeply.");
    }
    if (event == Event::object_start) keys_.emplace_back();
    if (event == Event::object_end) keys_.pop_back();
    if (event == Event::key && !keys_.back().insert(parsed.get<std::string>()).second)
      throw Unacceptable("The document repeats a key.");
    return true;
  }

 private:
  std::vector<std::set<std::string>> keys_;
};

RVValue valueOf(const nlohmann::json& json) {
  switch (json.type()) {
    case nlohmann::json::value_t::boolean:
      return json.get<bool>();
    case nlohmann::json::value_t::number_integer:
      return json.get<std::int64_t>();
    case nlohmann::json::value_t::number_unsigned: {
      const auto number = json.get<std::uint64_t>();
      if (number > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()))
        return static_cast<double>(number);
      return static_cast<std::int64_t>(number);
    }
    case nlohmann::json::value_t::number_float:
      return json.get<double>();
    case nlohmann::json::value_t::string:
      return json.get<std::string>();
    case nlohmann::json::value_t::array: {
      RVArray array;
      for (const auto& element : json) array.push_back(valueOf(element));
      return array;
    }
    case nlohmann::json::value_t::object: {
      RVDictionary dictionary;
      for (const auto& [key, member] : json.items()) dictionary.emplace(key, valueOf(member));
      return dictionary;
    }
    default:
      return {};
  }
}

RVJSONResult failure(std::string text) {
  return {std::nullopt,
          RVError{std::string(kRVJSONErrorDomain),
                  1,
                  {{std::string(kRVErrorLocalizedDescriptionKey), RVValue(std::move(text))}}}};
}

RVJSONResult read(std::string_view data) {
  if (data.size() > kMaximumSize) return failure("The document is too large.");
  if (data.substr(0, 3) == "\xEF\xBB\xBF") return failure("The document begins with a byte order mark.");
  try {
    return {valueOf(nlohmann::json::parse(data.begin(), data.end(), Strictness())), std::nullopt};
  } catch (const Unacceptable& unacceptable) {
    return failure(unacceptable.what());
  } catch (const nlohmann::json::parse_error& error) {
    return failure("The document is not JSON from byte " + std::to_string(error.byte) + " on.");
  } catch (const nlohmann::json::exception&) {
    return failure("The document holds a number that is out of range.");
  }
}

}  // namespace

FakeJSONReader::FakeJSONReader()
    : Fake("jsonReader") {
}

RVJSONResult FakeJSONReader::objectWithData(std::string_view data) {
  begin("objectWithData");
  {
    const std::lock_guard lock(mutex_);
    if (fixed_) return *fixed_;
  }
  return read(data);
}

void FakeJSONReader::readEverythingAs(std::optional<RVJSONResult> result) {
  const std::lock_guard lock(mutex_);
  fixed_ = std::move(result);
}

}  // namespace fakes
