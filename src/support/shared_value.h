// A small value that several threads may read and replace.
#pragma once
#include <atomic>
#include <mutex>
#include <type_traits>
#include <utility>

namespace lmx {

/// Copies in and out under a lock, so that no reader sees a partial value or a freed string. Thread-safe.
template <class T>
class SharedValue {
 public:
  SharedValue() = default;
  explicit SharedValue(T value) : value_(std::move(value)) {}
  SharedValue(const SharedValue&) = delete;
  SharedValue& operator=(const SharedValue&) = delete;

  [[nodiscard]] T get() const {
    const std::lock_guard lock(mutex_);
    return value_;
  }
  /// Destroys the old value after releasing the lock, because its destructor may run any code.
  void set(T value) {
    const std::lock_guard lock(mutex_);
    std::swap(value_, value);
  }
  /// Stores `value` and returns the previous one.
  T exchange(T value) {
    const std::lock_guard lock(mutex_);
    std::swap(value_, value);
    return value;
  }

 private:
  mutable std::mutex mutex_;
  T value_{};  // guarded by mutex_
};

/// Numbers, flags and plain pointers need no lock.
template <class T>
requires(std::is_arithmetic_v<T> || std::is_enum_v<T> || std::is_pointer_v<T>) class SharedValue<T> {
 public:
  SharedValue() = default;
  explicit SharedValue(T value) : value_(value) {}
  SharedValue(const SharedValue&) = delete;
  SharedValue& operator=(const SharedValue&) = delete;

  [[nodiscard]] T get() const { return value_; }
  void set(T value) { value_ = value; }
  T exchange(T value) { return value_.exchange(value); }
  /// Stores `value` unless something other than `expected` is stored by now.
  void replace(T expected, T value) { value_.compare_exchange_strong(expected, value); }

 private:
  std::atomic<T> value_{};
};

}  // namespace lmx
