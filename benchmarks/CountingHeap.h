// Counts what is allocated on the heap, for the benchmarks that report it.
#pragma once

#include <cstddef>

namespace benchmarks {

// The number of allocations that this thread has made so far.
std::size_t heapAllocations();

}  // namespace benchmarks
