// The bytes that have arrived on a stream, cut into frames.
//
//   const std::span<std::byte> room = input.room(kReadSize, kKept);
//   input.arrived(read into `room`);
//   while (input.next(maximum_body, frame) == FrameResult::complete) …
//
// One who reads from many streams, most of which are at rest, has them share the memory that they are read into:
//
//   if (!input.borrow(read into the shared memory)) …
//   if (input.next(maximum_body, frame) == FrameResult::complete) …
//   if (!input.keep()) …
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

  /// Takes in bytes that lie in memory of the caller's. Where nothing is left of earlier ones, they stay there until
  /// `keep` copies those that belong to no frame handed out, and the frames lie there. False when memory runs out.
  [[nodiscard]] bool borrow(std::span<const std::byte> bytes) noexcept;
  [[nodiscard]] bool keep() noexcept;
  /// How many bytes have been copied and are held.
  [[nodiscard]] std::size_t held() const noexcept { return bytes_.size(); }
  [[nodiscard]] bool empty() const noexcept { return rest().empty(); }

  /// The next frame, as `parse_frame` gives it; it stays valid until room is asked for, bytes are borrowed or kept.
  [[nodiscard]] FrameResult next(std::uint32_t maximum_body, Frame& frame) noexcept;
  /// What `next` would answer, without taking anything.
  [[nodiscard]] FrameResult look(std::uint32_t maximum_body) const noexcept;

  /// Forgets everything, the memory included.
  void clear() noexcept { *this = FrameInput(); }

 private:
  [[nodiscard]] std::span<const std::byte> rest() const noexcept {
    return borrowed_.empty() ? bytes_.bytes().subspan(taken_) : borrowed_;
  }

  ByteBuffer bytes_;
  std::size_t taken_ = 0;                // of them, those that belong to frames handed out
  std::span<const std::byte> borrowed_;  // without frames handed out; when there are any, `bytes_` is empty
};

}  // namespace quorvel::wire
