// The description of a value: one line that a reader of the log can make sense of.
#pragma once

#include <cstddef>
#include <span>
#include <string_view>

#include "property/value.h"

namespace quorvel {

/// A text under construction in somebody's buffer, which takes no more once something had to be cut.
class TextSink {
 public:
  explicit TextSink(std::span<char> room) noexcept : at_(room.data()), end_(room.data() + room.size()) {}
  /// Adds bytes as they are; what does not fit is cut off between characters, and the sink is full from then on.
  void put(std::string_view text) noexcept;
  void put(char byte) noexcept { put(std::string_view(&byte, 1)); }
  /// Adds a text with bytes that are not UTF-8 and characters that are unsafe to display escaped, so that it stays on
  /// its line.
  void put_escaped(std::string_view text) noexcept;
  void put_decimal(std::int64_t number) noexcept;
  void put_decimal(std::uint64_t number) noexcept;
  [[nodiscard]] bool full() const noexcept { return full_; }
  [[nodiscard]] char* position() const noexcept { return at_; }

 private:
  char* at_;
  char* end_;
  bool full_ = false;
};

/// Writes the description of `value`: a text as it is (as `put_escaped` adds it), a number in decimal, `true` or
/// `false`, data as `<89504e47 … 12 bytes>`, a date in ISO 8601 UTC, a container on one line with its texts quoted, no
/// value as `(null)`. Stops where the sink is full. Any thread.
void describe(const PropertyValue& value, TextSink& sink) noexcept;

}  // namespace quorvel
