// The host's strict JSON reader.
#pragma once

#include <cstddef>

#include "host/JSONReader.h"

namespace http {

inline constexpr std::size_t kMaximumJSONSize = 1024 * 1024;  // bytes of a document
inline constexpr std::size_t kMaximumJSONDepth = 64;          // containers inside one another

// The codes of errors in the domain kRVJSONErrorDomain.
enum class JSONErrorCode {
  kTooLarge = 1,      // more than kMaximumJSONSize
  kNotJSON,           // not one JSON document in UTF-8 without a byte order mark, and nothing after it
  kTooDeep,           // more than kMaximumJSONDepth
  kRepeatedKey,       // an object has two members of one name
  kNumberOutOfRange,  // an integer beyond 64 bits with sign, or a real number beyond a double
};

// Reads integers as 64-bit integers and everything with a fraction or an exponent as a double. Error texts
// name the place by line and column, both counted from 1, the column in bytes.
class JSONReader final : public RVJSONReader {
 public:
  RVJSONResult objectWithData(std::string_view data) override;
};

}  // namespace http
