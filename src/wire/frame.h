// The frames that travel between processes: a fixed head, a name, and at most one binary property list. docs/wire.md
// describes them for clients in other languages.
//
//   offset  size  field (integers big-endian)
//        0     4  body length: the bytes that follow the head
//        4     1  kind
//        5     1  flags
//        6     2  name length; the name (ASCII) opens the body
//        8     8  serial
//       16        name, then the binary property list; no bytes there mean no value
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

#include "property/binary/checked_bytes.h"
#include "property/byte_buffer.h"
#include "property/value.h"

namespace quorvel::wire {

inline constexpr std::size_t kFrameHeadSize = 16;
inline constexpr std::size_t kMaximumNameLength = 255;

enum class FrameKind : std::uint8_t {
  call = 1,          // client to service: serial chosen by the client, name of the operation, the argument
  reply = 2,         // service to client: the call's serial, the value
  failure = 3,       // service to client: the call's serial, {"Code": integer, "Description": string}
  ready = 4,         // notification center to an observer that was taken in: the newest sequence number
  notification = 5,  // notification center: serial is the sequence number, name the notification, value its object
  missed = 6,        // notification center: how many were dropped for this observer, an integer; serial: the last one
  state = 7,         // telephony service: its whole state
  event = 8,         // telephony service: a notification's name and the whole state
};

/// In a call: the client does not wait for a reply, and none is sent.
inline constexpr std::uint8_t kFlagNoReply = 1;

struct FrameHead {
  std::uint32_t body_length;
  FrameKind kind;
  std::uint8_t flags;
  std::uint16_t name_length;
  std::uint64_t serial;
};

/// A frame taken apart; name and payload point into the bytes it came from.
struct Frame {
  FrameHead head;
  std::string_view name;
  std::span<const std::byte> payload;
};

enum class FrameResult { complete, incomplete, refused };

/// Takes the first frame off `bytes`. `incomplete` when more bytes are needed; `refused` when the head cannot be one
/// (unknown kind or flag, a name longer than the body or not printable ASCII, a body longer than `maximum_body`). Any
/// thread.
[[nodiscard]] FrameResult parse_frame(std::span<const std::byte> bytes, std::uint32_t maximum_body,
                                      Frame& frame) noexcept;

/// Appends a frame around `value` (none: an empty payload) to `out`. False, and `out` as it was, when the name is too
/// long or not printable ASCII, the value cannot be encoded, the body exceeds 4 GiB, or memory runs out. Any thread.
[[nodiscard]] bool append_frame(FrameKind kind, std::uint8_t flags, std::uint64_t serial, std::string_view name,
                                const PropertyValue& value, ByteBuffer& out) noexcept;
/// The same around a value's checked bytes.
[[nodiscard]] bool append_frame(FrameKind kind, std::uint8_t flags, std::uint64_t serial, std::string_view name,
                                const CheckedBytes& value, ByteBuffer& out) noexcept;

/// Writes another serial into a whole frame.
void set_frame_serial(std::span<std::byte> frame, std::uint64_t serial) noexcept;

}  // namespace quorvel::wire
