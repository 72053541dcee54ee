// The daemon's own values and encoding.
#pragma once

#include <new>

#include "bench/support/measurements.h"
#include "bench/support/property_values.h"
#include "property/binary/binary.h"

namespace quorvel::bench {

struct QuorvelCodec {
  static constexpr std::string_view kName = kOurs;
  using Decoded = PropertyValue;
  using Encoded = ByteBuffer;

  static Decoded make(const DataSet& data) { return to_property(data); }
  static Encoded encode(const Decoded& value) {
    ByteBuffer bytes;
    encode_again(value, bytes);
    return bytes;
  }
  static void encode_again(const Decoded& value, Encoded& used) {
    used.clear();
    if (!write_binary(value, used)) throw std::bad_alloc();
  }
  static std::span<const std::byte> bytes(const Encoded& encoded) { return encoded.bytes(); }
  static Decoded decode(std::span<const std::byte> bytes) { return read_binary(bytes, Mutability::immutable); }
  static std::size_t size(const Decoded& value) { return value.size(); }
  static bool matches(const Decoded& value, const DataSet& data) { return bench::matches(value, data); }
};

}  // namespace quorvel::bench
