// Between the handles of the C interface and the objects behind them.
#pragma once

#include <cstdlib>
#include <new>
#include <utility>

#include "client/core/failure.h"
#include "property/value.h"
#include "quorvel.h"

namespace quorvel::capi {

// The handle of a value is the value's word: it needs no memory of its own, and one lent from a container is the
// slot's.

/// The handle that takes over `value`'s reference.
[[nodiscard]] inline quorvel_value* hand_out(PropertyValue value) noexcept {
  return reinterpret_cast<quorvel_value*>(value.take());
}
/// The handle of a value that goes on to hold its reference.
[[nodiscard]] inline const quorvel_value* lend(const PropertyValue& value) noexcept {
  return reinterpret_cast<const quorvel_value*>(value.word());
}
/// The value that takes over the reference of `handle`.
[[nodiscard]] inline PropertyValue take_over(quorvel_value* handle) noexcept {
  return PropertyValue::adopt(reinterpret_cast<detail::Word>(handle));
}

/// The value behind a handle, whose reference stays with the handle.
class Lent {
 public:
  explicit Lent(const quorvel_value* handle) noexcept : word_(reinterpret_cast<detail::Word>(handle)) {}
  [[nodiscard]] const PropertyValue& operator*() const noexcept { return borrowed(word_); }
  [[nodiscard]] const PropertyValue* operator->() const noexcept { return &borrowed(word_); }

 private:
  detail::Word word_;
};

/// A new object, or null when memory runs out; the library has no operator new.
template <typename Object>
[[nodiscard]] Object* make() noexcept {
  void* memory = std::malloc(sizeof(Object));
  return memory != nullptr ? new (memory) Object() : nullptr;
}

template <typename Object>
void unmake(Object* object) noexcept {
  if (object == nullptr) return;
  object->~Object();
  std::free(object);
}

/// Tells the caller, unless `error` is null. Returns the failure's code.
int tell(const client::Failure& failure, quorvel_error* error) noexcept;
int tell(quorvel_code code, std::string_view sentence, quorvel_error* error) noexcept;
int tell_out_of_memory(quorvel_error* error) noexcept;

}  // namespace quorvel::capi
