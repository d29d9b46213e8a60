// Owner of a block from malloc, for the functions whose contract is "the caller frees".
#pragma once
#include <cstdlib>
#include <memory>

namespace lmx {

struct FreeDeleter {
  void operator()(void* block) const noexcept { std::free(block); }
};

/// Frees with free(). Hold the result of every support function that returns memory in one.
template <class T>
using heap_ptr = std::unique_ptr<T, FreeDeleter>;

}  // namespace lmx
