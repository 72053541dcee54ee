// The store key of a domain and a key, built and hashed before the store lock is taken, usually without an allocation.
#pragma once

#include <cstdlib>

#include "property/value.h"

namespace quorvel {

class StoreKey {
 public:
  /// A domain or key that is no string counts as none.
  StoreKey(const PropertyValue& domain, const PropertyValue& key) noexcept;
  StoreKey(const StoreKey&) = delete;
  StoreKey& operator=(const StoreKey&) = delete;
  ~StoreKey() {
    if (text_ != few_) std::free(text_);
  }

  /// False when memory ran out.
  [[nodiscard]] explicit operator bool() const noexcept { return text_ != nullptr; }
  [[nodiscard]] const HashedKey& hashed() const noexcept { return hashed_; }
  [[nodiscard]] std::string_view text() const noexcept { return hashed_.text; }
  /// The store key of the domain itself: the text up to the hyphen behind the domain, the hyphen included.
  [[nodiscard]] std::string_view domain_text() const noexcept { return text().substr(0, domain_length_); }
  [[nodiscard]] bool has_key() const noexcept { return has_key_; }

 private:
  static constexpr std::size_t kFew = 248;

  char* text_;
  std::size_t domain_length_;
  bool has_key_;
  char few_[kFew];
  HashedKey hashed_;
};

}  // namespace quorvel
