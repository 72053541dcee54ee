#include "store/store_key.h"

#include <cstring>

#include "files/value_helpers.h"
#include "store/data_ark.h"

namespace quorvel {

namespace {

char* put(char* at, std::string_view text) noexcept {
  if (!text.empty()) std::memcpy(at, text.data(), text.size());
  return at + text.size();
}

}  // namespace

StoreKey::StoreKey(const PropertyValue& domain, const PropertyValue& key) noexcept : hashed_(std::string_view{}) {
  const std::string_view domain_text = domain.text();
  const std::string_view key_text = key.text();
  const std::size_t length = domain_text.size() + 1 + key_text.size();
  has_key_ = key.is_string();
  domain_length_ = domain_text.size() + 1;
  text_ = length <= kFew ? few_ : static_cast<char*>(std::malloc(length));
  if (text_ == nullptr) return;
  char* at = put(text_, domain_text);
  *at++ = '-';
  put(at, key_text);
  hashed_ = HashedKey(std::string_view(text_, length));
}

PropertyValue data_ark_key(const PropertyValue& domain, const PropertyValue& key) noexcept {
  const StoreKey store_key(domain, key);
  return store_key ? PropertyValue::joined_string(store_key.text(), {}) : PropertyValue{};
}

}  // namespace quorvel
