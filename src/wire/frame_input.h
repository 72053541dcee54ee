// The bytes that have arrived on a stream, cut into frames.
//
//   const std::span<std::byte> room = input.room(kReadSize, kKept);
//   input.arrived(read into `room`);
//   while (input.next(maximum_body, frame) == FrameResult::complete) …
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "property/byte_buffer.h"
#include "wire/frame.h"

namespace quorvel::wire {

class FrameInput {
 public:
  /// Room for at least `least` bytes to arrive in; empty when memory runs out. The frames that were handed out are let
  /// go of, and once all were, so is memory beyond `kept` bytes. Grows with the bytes that have arrived, never with the
  /// length that a head announces.
  [[nodiscard]] std::span<std::byte> room(std::size_t least, std::size_t kept) noexcept;
  /// Says how many bytes were put into the room.
  void arrived(std::size_t count) noexcept;

  /// The next frame, as `parse_frame` gives it; it stays valid until room is asked for.
  [[nodiscard]] FrameResult next(std::uint32_t maximum_body, Frame& frame) noexcept;
  /// What `next` would answer, without taking anything.
  [[nodiscard]] FrameResult look(std::uint32_t maximum_body) const noexcept;

  /// Forgets everything, the memory included.
  void clear() noexcept { *this = FrameInput(); }

 private:
  ByteBuffer bytes_;
  std::size_t taken_ = 0;  // bytes that belong to frames handed out
};

}  // namespace quorvel::wire
