// One pass over the objects in the order of their numbers. A container may only refer to containers that come later,
// and each is referred to once, so nothing contains itself, nothing repeats, and a container's depth is known before
// it is reached.

#include "property/binary/binary_check.h"

#include <cstdlib>
#include <cstring>
#include <string_view>

#include "property/binary/binary_layout.h"
#include "property/binary/leaf_reader.h"
#include "property/binary/short_text.h"
#include "property/limits.h"
#include "property/unicode.h"

namespace quorvel::detail {

namespace format = binary_format;

namespace {

std::string_view text_of(const EncodedObject& object) noexcept {
  return {reinterpret_cast<const char*>(object.body), object.size};
}

bool is_valid_leaf(const EncodedObject& object) noexcept {
  switch (object.kind) {
    case format::kAsciiText: return is_ascii(text_of(object));
    case format::kUtf16Text: return utf8_length_of_utf16(object.body, object.size) != SIZE_MAX;
    case format::kInteger: return object.size < 16 || fits_64_bits(object);
    default: return true;
  }
}

class Checker {
 public:
  explicit Checker(std::span<const std::byte> bytes) noexcept : valid_(layout_.parse(bytes) && layout_.top() == 0) {}
  ~Checker() { std::free(depths_); }
  Checker(const Checker&) = delete;
  Checker& operator=(const Checker&) = delete;

  bool check() noexcept {
    if (!valid_) return false;
    depths_ = static_cast<std::uint16_t*>(std::calloc(layout_.count(), sizeof(std::uint16_t)));
    if (depths_ == nullptr) return false;
    depths_[0] = 1;
    std::uint64_t i = 0, end = format::kHeader.size();
    for (;; ++i) {
      if (!check_short_leaves(i, end)) return false;
      if (i == layout_.count()) break;
      const std::uint64_t offset = layout_.offset_of(i);
      EncodedObject object;
      if (offset < end || !layout_.object_at(offset, object)) return false;
      end = layout_.offset_at(object.end);
      if (!(object.is_container() ? check_container(i, object) : is_valid_leaf(object))) return false;
    }
    EncodedObject top;
    return layout_.object_at(layout_.offset_of(0), top) && top.kind == format::kDictionary;
  }

 private:
  // Moves `number` to the first object that is no short leaf, and `end` to where the one before it ends.
  bool check_short_leaves(std::uint64_t& number, std::uint64_t& end) const noexcept {
    const BinaryLayout layout = layout_;
    const std::uint64_t limit = layout.limit_of(kLargestShortObject);
    std::uint64_t foreign = 0;
    for (; number < layout.count(); ++number) {
      const std::uint64_t offset = layout.offset_of(number);
      ShortLeaf leaf;
      if (offset < end || offset >= limit || !find_short_leaf(layout.at(offset), leaf)) break;
      foreign |= foreign_bits(leaf, gather_chunks(leaf.body, leaf.size, [](std::size_t, const Chunk&) {}));
      end = layout.offset_at(leaf.body + leaf.size);
    }
    return foreign == 0;
  }

  bool check_container(std::uint64_t number, const EncodedObject& object) noexcept {
    if (depths_[number] == 0 || depths_[number] > kMaximumDepth) return false;
    const std::byte* at = object.body;
    if (object.kind == format::kDictionary && !check_keys(object, at)) return false;
    for (; at != object.end; at += layout_.reference_size()) {
      if (!check_element(number, layout_.reference_at(at))) return false;
    }
    return true;
  }

  // Moves `at` behind the keys.
  bool check_keys(const EncodedObject& dictionary, const std::byte*& at) noexcept {
    std::string_view before, key;
    for (std::uint64_t i = 0; i < dictionary.size; ++i, at += layout_.reference_size()) {
      const std::uint64_t reference = layout_.reference_at(at);
      if (reference >= layout_.count() || !find_text(layout_.offset_of(reference), key)) return false;
      if (i > 0 && !stands_before(before, key)) return false;
      before = key;
    }
    return true;
  }

  // The bytes of a text that is marked as ASCII.
  bool find_text(std::uint64_t offset, std::string_view& text) const noexcept {
    ShortLeaf leaf;
    if (offset < layout_.limit_of(kLargestShortObject) && find_short_leaf(layout_.at(offset), leaf)) {
      text = {reinterpret_cast<const char*>(leaf.body), leaf.size};
      return offset >= format::kHeader.size() && leaf.marker.kind == PropertyKind::string;
    }
    EncodedObject object;
    if (!layout_.object_at(offset, object) || object.kind != format::kAsciiText) return false;
    text = text_of(object);
    return true;
  }

  // Only what is a container by its marker needs a place in the tree; whether it is a sound one shows at its turn.
  bool check_element(std::uint64_t parent, std::uint64_t reference) noexcept {
    if (reference >= layout_.count()) return false;
    const std::byte* marker = layout_.marker_at(layout_.offset_of(reference));
    if (marker == nullptr) return false;
    const auto kind = static_cast<std::uint8_t>(*marker) >> 4;
    if (kind != format::kArray && kind != format::kDictionary) return true;
    if (reference <= parent || depths_[reference] != 0) return false;
    depths_[reference] = static_cast<std::uint16_t>(depths_[parent] + 1);
    return true;
  }

  BinaryLayout layout_;
  bool valid_;
  std::uint16_t* depths_ = nullptr;  // of containers; 0 until one is referred to
};

}  // namespace

bool is_common_dictionary(std::span<const std::byte> bytes) noexcept { return Checker(bytes).check(); }

}  // namespace quorvel::detail
