// The binary property-list encoding, both ways. The format itself stands in format.h.
#pragma once

#include <cstddef>
#include <span>

#include "property/binary/omitted_entries.h"
#include "property/byte_buffer.h"
#include "property/value.h"

namespace quorvel {

/// Reads one property list that takes up all of `bytes`; the value does not refer to them afterwards. With
/// `Mutability::immutable` nothing in the result accepts changes; with `mutable_containers` every dictionary and array
/// does. No value when the bytes are not a valid binary property list, break a bound of limits.h, or memory runs out.
/// Any thread.
[[nodiscard]] PropertyValue read_binary(std::span<const std::byte> bytes, Mutability mutability) noexcept;

/// Appends the encoding of `value`, without the entries of it that are `omitted`, to `out`. Equal values give equal
/// bytes. False, and `out` as it was, when there is no value, it breaks a bound of limits.h, or memory runs out. Any
/// thread.
[[nodiscard]] bool write_binary(const PropertyValue& value, ByteBuffer& out,
                                const OmittedEntries& omitted = {}) noexcept;

}  // namespace quorvel
