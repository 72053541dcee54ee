// Work on the bytes of short texts, sixteen at a time, in chunks that overlap. Lengths vary from text to text, so that
// a branch on a length is mispredicted; whatever depends on one stands in a table, because compilers make branches of
// comparisons.
#pragma once

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "property/binary/format.h"
#include "property/node.h"

namespace quorvel::detail {

/// Up to this length a text is short.
inline constexpr std::size_t kShortText = 48;

/// Sixteen bytes of a text.
using Chunk [[gnu::vector_size(16)]] = std::uint64_t;

static_assert(kShortText <= 3 * sizeof(Chunk), "three chunks cover every short text");
static_assert(BytesNode::kBytesOffset + sizeof(Chunk) <= BytesNode::allocation(0),
              "a chunk at the beginning of the shortest text can be read and written");
static_assert(BytesNode::allocation(kShortText) + 7 <= UINT8_MAX, "a short text's room fits its field");

/// Where the chunks lie that cover a short text together with the one at its beginning.
struct ShortShape {
  std::uint8_t middle;
  std::uint8_t last;
  std::uint8_t beyond;  // bytes of the first chunk that are not the text's
  std::uint8_t room;    // bytes of its node in a block
};

/// By length.
inline constexpr auto kShortShapes = [] {
  std::array<ShortShape, kShortText + 1> shapes{};
  for (std::size_t length = 0; length <= kShortText; ++length) {
    const std::size_t last = length < sizeof(Chunk) ? 0 : length - sizeof(Chunk);
    shapes[length] = {static_cast<std::uint8_t>(std::min(last, sizeof(Chunk))), static_cast<std::uint8_t>(last),
                      static_cast<std::uint8_t>(length < sizeof(Chunk) ? sizeof(Chunk) - length : 0),
                      static_cast<std::uint8_t>((BytesNode::allocation(length) + 7) / 8 * 8)};
  }
  return shapes;
}();

/// Calls `visit(offset)` for offsets whose chunks cover a short text, some bytes more than once; of a text shorter than
/// a chunk, the chunk reaches beyond the end.
template <class Visit>
inline void visit_chunks(std::size_t length, Visit&& visit) noexcept {
  const ShortShape shape = kShortShapes[length];
  visit(std::size_t{0});
  visit(std::size_t{shape.middle});
  visit(std::size_t{shape.last});
}

/// All chunks of a short text together; each is handed to `keep`, with its offset, on the way.
template <class Keep>
[[nodiscard]] inline Chunk gather_chunks(const std::byte* text, std::size_t length, Keep&& keep) noexcept {
  Chunk all{};
  visit_chunks(length, [&](std::size_t offset) {
    Chunk chunk;
    std::memcpy(&chunk, text + offset, sizeof chunk);
    keep(offset, chunk);
    all |= chunk;
  });
  return all;
}

/// Not 0 when a byte of a short text is above 0x7f, `all` being all its chunks together.
[[nodiscard]] inline std::uint64_t high_bits(Chunk all, std::size_t length) noexcept {
  static constexpr auto kHighBits = [] {
    std::array<std::uint8_t, 2 * sizeof(Chunk)> bits{};
    std::fill_n(bits.begin(), sizeof(Chunk), std::uint8_t{0x80});
    return bits;
  }();
  Chunk mask;
  std::memcpy(&mask, kHighBits.data() + kShortShapes[length].beyond, sizeof mask);
  mask &= all;
  return mask[0] | mask[1];
}

/// Whether `left` stands before `right` in ascending order. Neighbouring keys share much of their beginning.
[[nodiscard]] inline bool stands_before(std::string_view left, std::string_view right) noexcept {
  const std::size_t shared = std::min(left.size(), right.size());
  if (shared < 8) return left < right;
  std::size_t at = 0;
  while (at + 8 < shared && std::memcmp(left.data() + at, right.data() + at, 8) == 0) at += 8;
  at = std::min(at, shared - 8);
  const auto word = [at](std::string_view text) {
    return binary_format::get_integer(reinterpret_cast<const std::byte*>(text.data()) + at, 8);
  };
  const std::uint64_t a = word(left), b = word(right);
  return a != b ? a < b : left.size() < right.size();
}

}  // namespace quorvel::detail
