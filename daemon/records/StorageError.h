// How a failure of what lasts is told to a plug-in.
#pragma once

#include <string>

#include "host/Values.h"

namespace records {

inline constexpr int kStorageErrorCode = 1;

// An error of RVErrorDomain with a text for a person.
inline RVError storageError(std::string text, int code = kStorageErrorCode) {
  return {std::string(RVErrorDomain),
          code,
          {{std::string(kRVErrorLocalizedDescriptionKey), RVValue(std::move(text))}}};
}

inline constexpr const char* kRequestIsVoid = "the request is void";

}  // namespace records
