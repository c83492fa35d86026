// One method of a bus interface, as the tables made from the XML hold it.
#pragma once

#include <string>
#include <vector>

namespace interfaces {

struct Method {
  std::string name;
  std::string inputSignature;
  std::vector<std::string> inputNames;
  std::string outputSignature;
  std::vector<std::string> outputNames;
};

}  // namespace interfaces
