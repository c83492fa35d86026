// Documents as rvctl takes them from the bus and prints them.
#pragma once

#include <nlohmann/json_fwd.hpp>

namespace cli {

// Keeps its keys in the order in which they were added.
using Json = nlohmann::ordered_json;

}  // namespace cli
