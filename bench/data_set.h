// The data that every contender gets: entries as a device's store holds them, always the same ones for a count.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <variant>
#include <vector>

namespace quorvel::bench {

struct Date {
  double seconds;  // since 2001-01-01T00:00:00Z
  bool operator==(const Date&) const = default;
};
using Bytes = std::vector<std::uint8_t>;
struct Value;
using Array = std::vector<Value>;
struct Member;
using Dictionary = std::vector<Member>;  // keys ascending

/// A value in no contender's own form. What a contender decodes or hands out is turned back into this and compared.
struct Value {
  std::variant<std::string, std::int64_t, bool, Bytes, Date, Array, Dictionary> content;
  bool operator==(const Value& other) const;
};

struct Member {
  std::string key;
  Value value;
  bool operator==(const Member&) const = default;
};

struct Entry {
  std::string domain;
  std::string key;
  std::string store_key;  // domain and key, joined by a hyphen
  Value value;
  Value changed;  // of the same kind, but not equal to `value`
};

using DataSet = std::vector<Entry>;

inline constexpr std::size_t kKeysOfDomain = 50;

/// `count` entries, fifty to a domain, shuffled: half texts of 4 to 24 bytes (one in twenty not ASCII), a fifth
/// integers, a tenth booleans, a tenth data of 32 bytes, the rest dates and containers of 4 to 6 elements. Made once;
/// any thread.
const DataSet& data_set(std::size_t count);

}  // namespace quorvel::bench
