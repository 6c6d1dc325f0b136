// SPDX-License-Identifier: MIT
#pragma once

#include <gtest/gtest.h>

#include <cstddef>
#include <tuple>
#include <type_traits>
#include <utility>

namespace n3ds::testing {

template <size_t kAt, typename Code, typename Function, typename Arguments>
void ExpectNullRefusedAt(Code refusal, Function function, Arguments arguments) {
  if constexpr (std::is_pointer_v<std::tuple_element_t<kAt, Arguments>>) {
    if (std::get<kAt>(arguments) == nullptr) return;
    std::get<kAt>(arguments) = nullptr;
    EXPECT_EQ(std::apply(function, arguments), refusal) << "argument " << kAt << " is null";
  }
}

template <typename Code, typename Function, typename Arguments, size_t... kAt>
void ExpectNullsRefused(Code refusal, Function function, const Arguments& arguments,
                        std::index_sequence<kAt...>) {
  (ExpectNullRefusedAt<kAt>(refusal, function, arguments), ...);
}

// Calls the function with one pointer after the other set to null, which it has to answer with
// `refusal`. A pointer that is null among the arguments may be so, and stays.
template <typename Code, typename Result, typename... Parameters>
void ExpectEachNullRefused(Code refusal, Result (*function)(Parameters...),
                           std::common_type_t<std::decay_t<Parameters>>... arguments) {
  using Arguments = std::tuple<std::decay_t<Parameters>...>;
  ExpectNullsRefused(refusal, function, Arguments(arguments...),
                     std::index_sequence_for<Parameters...>());
}

}  // namespace n3ds::testing
