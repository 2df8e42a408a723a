// What the C++ that Describe.cs prints asks rcvlink.h.
#ifndef RCVLINK_TESTS_CSHARP_AGREEMENT_H_
#define RCVLINK_TESTS_CSHARP_AGREEMENT_H_

#include <windows.h>

#include <algorithm>
#include <cstddef>
#include <initializer_list>
#include <utility>

#include "rcvlink.h"
// After rcvlink.h, whose records it then uses. A header for C has C's casts.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wold-style-cast"
#include "rcvlink_c.h"
#pragma GCC diagnostic pop

// Stands for a field of any type.
struct AnyField {
  template <typename Field>
  operator Field() const;
};

template <typename Record, size_t... kFields>
constexpr bool HasFields(std::index_sequence<kFields...>) {
  return requires { Record{(static_cast<void>(kFields), AnyField{})...}; };
}

// How many fields an aggregate has: as many as initialise it.
template <typename Record, size_t kCount = 1>
constexpr size_t FieldCount() {
  if constexpr (HasFields<Record>(std::make_index_sequence<kCount + 1>())) {
    return FieldCount<Record, kCount + 1>();
  } else {
    return kCount;
  }
}

template <typename Type>
constexpr size_t kSizeOf = sizeof(Type);
template <>
constexpr size_t kSizeOf<void> = 0;

// Whether a function of the library has a result and parameters of these sizes.
template <typename Result, typename... Parameters>
constexpr bool IsLike(Result (*RcvlinkFunctions::*)(Parameters...),
                      size_t result,
                      std::initializer_list<size_t> parameters) {
  const std::initializer_list<size_t> own = {sizeof(Parameters)...};
  return result == kSizeOf<Result> && std::ranges::equal(own, parameters);
}

#endif  // RCVLINK_TESTS_CSHARP_AGREEMENT_H_
