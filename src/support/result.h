// A value, or the reason why there is none.
#pragma once
#include <cerrno>
#include <cstring>
#include <optional>
#include <string>
#include <utility>
#include <variant>

namespace lmx {

/// Why something failed. Whoever returns it says whether the message also names what failed.
struct Error {
  std::string message;
  int systemError = 0;  ///< errno when the system reported the reason, else 0

  /// `what` is no temporary: making one could change errno. "WHAT: reason", with the system's text for
  /// `systemError`.
  static Error fromSystem(const std::string& what, int systemError = errno) {
    return {what + ": " + std::strerror(systemError), systemError};
  }
};

/// Holds either a value or an error. Check for a value before you use it.
template <class T, class E = Error>
class [[nodiscard]] Result {
 public:
  Result(T value)
      : state_(std::in_place_index<0>, std::move(value)) {}  // NOLINT: implicit, for plain returns
  Result(E error) : state_(std::in_place_index<1>, std::move(error)) {}  // NOLINT

  [[nodiscard]] bool ok() const { return state_.index() == 0; }
  explicit operator bool() const { return ok(); }

  // Undefined without a value.
  [[nodiscard]] T& operator*() & { return *std::get_if<0>(&state_); }
  [[nodiscard]] const T& operator*() const& { return *std::get_if<0>(&state_); }
  [[nodiscard]] T&& operator*() && { return std::move(*std::get_if<0>(&state_)); }
  [[nodiscard]] T* operator->() { return std::get_if<0>(&state_); }
  [[nodiscard]] const T* operator->() const { return std::get_if<0>(&state_); }

  [[nodiscard]] std::optional<T> value() const { return ok() ? std::optional<T>(**this) : std::nullopt; }

  // Undefined with a value.
  [[nodiscard]] const E& error() const& { return *std::get_if<1>(&state_); }
  [[nodiscard]] E&& error() && { return std::move(*std::get_if<1>(&state_)); }

 private:
  std::variant<T, E> state_;
};

}  // namespace lmx
