#include "daemon/http/CurlLibrary.h"

#include <curl/curl.h>
#include <malloc.h>
#include <string.h>

#include <algorithm>
#include <cstdlib>
#include <stdexcept>

namespace http {
namespace {

void wipingFree(void* memory) {
  if (memory == nullptr) return;
  explicit_bzero(memory, malloc_usable_size(memory));
  std::free(memory);
}

void* wipingRealloc(void* memory, std::size_t size) {
  if (memory == nullptr) return std::malloc(size);
  void* moved = std::malloc(size);
  if (moved == nullptr) return nullptr;
  memcpy(moved, memory, std::min(size, malloc_usable_size(memory)));
  wipingFree(memory);
  return moved;
}

}  // namespace

void setUpCurlLibrary() {
  // Never undone: a thread that still asks a name server may outlive every transfer.
  const CURLcode result = curl_global_init_mem(
      CURL_GLOBAL_DEFAULT, &std::malloc, &wipingFree, &wipingRealloc, &strdup, &std::calloc);
  if (result != CURLE_OK) throw std::runtime_error("libcurl cannot be set up");
}

}  // namespace http
