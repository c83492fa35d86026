// Reading JSON documents that came from outside.
#pragma once

#include <optional>
#include <string_view>

#include "host/Values.h"

// value: the document, absent where it could not be read. error: why not (domain kRVJSONErrorDomain);
// its text names what is wrong and where, and never quotes the document, which may hold a token.
struct RVJSONResult {
  std::optional<RVValue> value;
  std::optional<RVError> error;
};

// Called from any thread; keeps nothing.
class RVJSONReader {
 public:
  virtual ~RVJSONReader() = default;
  // Reads one document of any top-level kind, a bare string included. Strict: UTF-8 only, no repeated
  // keys, nothing after the document, limits on size and depth.
  virtual RVJSONResult objectWithData(std::string_view data) = 0;
};
