// A small value that several threads read and one or more replace.
#pragma once
#include <mutex>
#include <utility>

namespace lmx {

/// Copies in and out under a lock, so that no reader sees half a value or a freed string. Thread-safe.
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
  /// The old value is destroyed after the lock is released: its destructor may do anything.
  void set(T value) {
    const std::lock_guard lock(mutex_);
    std::swap(value_, value);
  }
  /// Stores `value` and returns what was there.
  T exchange(T value) {
    const std::lock_guard lock(mutex_);
    std::swap(value_, value);
    return value;
  }

 private:
  mutable std::mutex mutex_;
  T value_{};
};

}  // namespace lmx

/// Declares a field with its two accessors: `name()` returns a copy, `setter(value)` replaces it.
#define LMX_SHARED_FIELD(Type, name, setter)                 \
 public:                                                     \
  [[nodiscard]] Type name() const { return name##_.get(); }  \
  void setter(Type value) { name##_.set(std::move(value)); } \
                                                             \
 private:                                                    \
  ::lmx::SharedValue<Type> name##_;
