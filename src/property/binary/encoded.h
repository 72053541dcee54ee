// Immutable dictionaries that are still the bytes they came from: checked as strictly as any other, but taken apart
// only when somebody looks inside. Who merely passes one on passes on its bytes.
#pragma once

#include <cstddef>
#include <span>

#include "property/byte_buffer.h"
#include "property/value.h"

namespace quorvel {

/// What `read_binary` reads from `bytes`, immutable. A dictionary in the order that writers commonly choose keeps the
/// bytes and is taken apart at the first look inside; should memory run out then, it reads as empty. Any thread.
[[nodiscard]] PropertyValue read_encoded(ByteBuffer bytes) noexcept;

/// The binary property list that `value` was made from, for as long as the value is held; empty when it keeps none. The
/// bytes need not be those that `write_binary` gives. Any thread.
[[nodiscard]] std::span<const std::byte> encoded_bytes(const PropertyValue& value) noexcept;

}  // namespace quorvel
