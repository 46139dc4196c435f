// Bounds-checked element access for indices that come from requests or folder listings:
// a mismatch ends the request with std::out_of_range instead of undefined behaviour.
#pragma once

#include <cstddef>
#include <stdexcept>
#include <type_traits>
#include <vector>

namespace viraduve {

template <typename Index>
std::size_t checkedIndex(Index i, std::size_t size) {
  if constexpr (std::is_signed_v<Index>) {
    if (i < 0) throw std::out_of_range("invalid vector<T> subscript");
  }
  if (static_cast<std::size_t>(i) >= size) throw std::out_of_range("invalid vector<T> subscript");
  return static_cast<std::size_t>(i);
}

template <typename T, typename Index>
T& at(std::vector<T>& v, Index i) {
  return v[checkedIndex(i, v.size())];
}

template <typename T, typename Index>
const T& at(const std::vector<T>& v, Index i) {
  return v[checkedIndex(i, v.size())];
}

}  // namespace viraduve
