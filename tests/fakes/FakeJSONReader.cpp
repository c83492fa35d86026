#include <utility>

#include "daemon/http/JSONReader.h"
#include "tests/fakes/FakeTexts.h"

namespace fakes {

FakeJSONReader::FakeJSONReader()
    : Fake("jsonReader") {
}

RVJSONResult FakeJSONReader::objectWithData(std::string_view data) {
  begin("objectWithData");
  {
    const std::lock_guard lock(mutex_);
    if (fixed_) return *fixed_;
  }
  return http::JSONReader().objectWithData(data);
}

void FakeJSONReader::readEverythingAs(std::optional<RVJSONResult> result) {
  const std::lock_guard lock(mutex_);
  fixed_ = std::move(result);
}

}  // namespace fakes
