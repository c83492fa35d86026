// The names under which GoogleTest shows the implementations that a suite runs over.
#pragma once

#include <gtest/gtest.h>

#include <string>
#include <type_traits>

#include "tests/contract/Hosts.h"

namespace contract {

using Implementations = ::testing::Types<FakeServices, DaemonServices>;

struct Names {
  template <typename Services>
  static std::string GetName(int) {
    return std::is_same_v<Services, FakeServices> ? "Fakes" : "Daemon";
  }
};

}  // namespace contract
