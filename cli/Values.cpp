#include "cli/Values.h"

#include <sdbus-c++/sdbus-c++.h>

#include <cstdint>
#include <limits>
#include <nlohmann/json.hpp>
#include <vector>

namespace cli {
namespace {

constexpr int kDeepest = 16;

base::Failure unusable(const std::string& why) {
  return {base::FailureKind::kInvalid, "A preference cannot hold " + why};
}

// Whether the value is one of the type T; it is then put into the document.
template <typename T>
bool take(const sdbus::Variant& value, Json& document) {
  if (!value.containsValueOfType<T>()) return false;
  document = value.get<T>();
  return true;
}

base::Result<sdbus::Variant> variantOn(const Json& value, int level);

base::Result<sdbus::Variant> arrayOn(const Json& value, int level) {
  std::vector<sdbus::Variant> elements;
  for (const Json& element : value) {
    auto converted = variantOn(element, level + 1);
    if (!converted) return converted;
    elements.push_back(*std::move(converted));
  }
  return sdbus::Variant(elements);
}

base::Result<sdbus::Variant> dictionaryOn(const Json& value, int level) {
  std::map<std::string, sdbus::Variant> entries;
  for (const auto& [key, element] : value.items()) {
    if (key.find('\0') != std::string::npos) return unusable("a key with a NUL in it");
    auto converted = variantOn(element, level + 1);
    if (!converted) return converted;
    entries.insert_or_assign(key, *std::move(converted));
  }
  return sdbus::Variant(entries);
}

base::Result<sdbus::Variant> variantOn(const Json& value, int level) {
  if (value.is_structured() && level > kDeepest) return unusable("more than 16 levels");
  if (value.is_array()) return arrayOn(value, level);
  if (value.is_object()) return dictionaryOn(value, level);
  if (value.is_boolean()) return sdbus::Variant(value.get<bool>());
  if (value.is_number_float()) return sdbus::Variant(value.get<double>());
  if (value.is_string()) {
    const auto text = value.get<std::string>();
    if (text.find('\0') != std::string::npos) return unusable("a text with a NUL in it");
    return sdbus::Variant(text);
  }
  if (value.is_number_unsigned() &&
      value.get<std::uint64_t>() > static_cast<std::uint64_t>(std::numeric_limits<std::int64_t>::max()))
    return unusable("an integer of more than 64 bits with sign");
  if (value.is_number_integer()) return sdbus::Variant(value.get<std::int64_t>());
  return unusable("null");
}

}  // namespace

Json jsonFrom(const sdbus::Variant& value) {
  Json document;
  if (take<std::string>(value, document) || take<bool>(value, document) ||
      take<std::int64_t>(value, document) || take<std::int32_t>(value, document) ||
      take<double>(value, document) || take<std::vector<std::string>>(value, document))
    return document;
  if (value.containsValueOfType<std::vector<sdbus::Variant>>()) {
    document = Json::array();
    for (const sdbus::Variant& element : value.get<std::vector<sdbus::Variant>>())
      document.push_back(jsonFrom(element));
  } else if (value.containsValueOfType<std::map<std::string, sdbus::Variant>>()) {
    document = jsonFrom(value.get<std::map<std::string, sdbus::Variant>>());
  } else if (value.containsValueOfType<sdbus::Variant>()) {
    document = jsonFrom(value.get<sdbus::Variant>());
  }
  return document;
}

Json jsonFrom(const std::map<std::string, sdbus::Variant>& dictionary) {
  Json document = Json::object();
  for (const auto& [key, value] : dictionary) document[key] = jsonFrom(value);
  return document;
}

base::Result<sdbus::Variant> variantFrom(const Json& value) {
  return variantOn(value, 1);
}

}  // namespace cli
