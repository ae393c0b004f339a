// RelaxedField<T>: a plain-looking field that two threads may touch at once.
//
// The UI thread (touches, setters) and the GL threads (draw frames, surface callbacks) meet on
// session fields without a lock: a frame may show a mix of old and new values, which the
// keyboard accepts. To keep that lock-free behaviour without data races in C++ terms, such
// fields are std::atomic accessed with memory_order_relaxed: no ordering, no fences, the same
// machine code as a plain load/store on ARM64 and x86-64 for these sizes.
#pragma once

#include <atomic>

namespace tessel {

template <typename T>
class RelaxedField {
 public:
  constexpr RelaxedField() noexcept : value_(T{}) {}
  constexpr RelaxedField(T v) noexcept : value_(v) {}  // NOLINT: implicit by design
  RelaxedField(const RelaxedField&) = delete;

  operator T() const noexcept { return value_.load(std::memory_order_relaxed); }  // NOLINT
  T load() const noexcept { return value_.load(std::memory_order_relaxed); }
  RelaxedField& operator=(T v) noexcept {
    value_.store(v, std::memory_order_relaxed);
    return *this;
  }
  RelaxedField& operator=(const RelaxedField& other) noexcept { return *this = other.load(); }

 private:
  static_assert(std::atomic<T>::is_always_lock_free, "fields shared with draw calls must be lock-free");
  std::atomic<T> value_;
};

}  // namespace tessel
