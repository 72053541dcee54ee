#include "property/binary/omitted_entries.h"

namespace quorvel {

using namespace detail;

bool OmittedEntries::add(const PropertyValue& dictionary, const HashedKey& key) noexcept {
  if (!dictionary.is_dictionary()) return true;
  const DictionaryNode& node = dictionary_at(dictionary.word());
  const Entry* entry = find_entry(node, key);
  if (entry == nullptr) return true;
  if (bits_ == nullptr) bits_ = static_cast<std::uint64_t*>(std::calloc(node.used / 64 + 1, sizeof(std::uint64_t)));
  if (bits_ == nullptr) return false;
  const auto position = static_cast<std::size_t>(entry - node.entries());
  count_ += contains(position) ? 0 : 1;
  bits_[position / 64] |= std::uint64_t{1} << (position % 64);
  return true;
}

}  // namespace quorvel
