#pragma once

#include "base/KVError.h"

#include <utility>
#include <variant>

namespace kelvo {

/// What a fallible operation gives back: a value or an error.
template <typename T>
class [[nodiscard]] Result {
  public:
    Result(T value) : content_(std::in_place_index<0>, std::move(value)) {}
    Result(KVError error) : content_(std::in_place_index<1>, std::move(error)) {}

    explicit operator bool() const { return content_.index() == 0; }

    /// Only when it succeeded.
    T& operator*() { return std::get<0>(content_); }
    const T& operator*() const { return std::get<0>(content_); }
    T* operator->() { return &std::get<0>(content_); }
    const T* operator->() const { return &std::get<0>(content_); }

    /// Only when it failed.
    const KVError& error() const { return std::get<1>(content_); }

    OptionalError optionalError() const { return *this ? OptionalError() : OptionalError(error()); }

    T valueOr(T fallback) const { return *this ? std::get<0>(content_) : std::move(fallback); }

  private:
    std::variant<T, KVError> content_;
};

}  // namespace kelvo
