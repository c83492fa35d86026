// Whatever the bytes are, the reader gives either a value or an error with a text, never both, and the text
// does not quote the document.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <string_view>

#include "daemon/http/JSONReader.h"

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* bytes, std::size_t size) {
  // A canary that the input cannot hold by chance, as a text inside of the document.
  constexpr std::string_view kCanary = "\"canary-7c1f\"";
  std::string document(reinterpret_cast<const char*>(bytes), size);
  if (const std::size_t place = document.find("\"\""); place != std::string::npos)
    document.replace(place, 2, kCanary);

  const RVJSONResult result = http::JSONReader().objectWithData(document);
  if (result.value.has_value() == result.error.has_value()) std::abort();
  if (!result.error) return 0;
  const auto text = result.error->localizedDescription();
  if (!text || text->empty() || text->find("canary") != std::string::npos) std::abort();
  return 0;
}
