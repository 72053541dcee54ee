#include "wire/frame.h"

#include <algorithm>

#include "property/binary/binary.h"

namespace quorvel::wire {

namespace {

template <typename Number>
[[nodiscard]] Number read_big_endian(const std::byte* bytes) noexcept {
  Number number = 0;
  for (std::size_t i = 0; i < sizeof(Number); ++i) {
    number = static_cast<Number>((number << 8) | std::to_integer<Number>(bytes[i]));
  }
  return number;
}

template <typename Number>
void write_big_endian(Number number, std::byte* bytes) noexcept {
  for (std::size_t i = sizeof(Number); i > 0; --i) {
    bytes[i - 1] = static_cast<std::byte>(number & 0xff);
    number = static_cast<Number>(number >> 8);
  }
}

[[nodiscard]] FrameHead read_head(const std::byte* bytes) noexcept {
  return {read_big_endian<std::uint32_t>(bytes), static_cast<FrameKind>(bytes[4]),
          std::to_integer<std::uint8_t>(bytes[5]), read_big_endian<std::uint16_t>(bytes + 6),
          read_big_endian<std::uint64_t>(bytes + 8)};
}

[[nodiscard]] bool is_possible(const FrameHead& head, std::uint32_t maximum_body) noexcept {
  const std::uint8_t known_flags = head.kind == FrameKind::call ? kFlagNoReply : 0;
  return head.kind >= FrameKind::call && head.kind <= FrameKind::event && (head.flags & ~known_flags) == 0 &&
         head.name_length <= kMaximumNameLength && head.name_length <= head.body_length &&
         head.body_length <= maximum_body;
}

[[nodiscard]] bool is_printable(std::string_view name) noexcept {
  return std::all_of(name.begin(), name.end(), [](char c) { return c >= ' ' && c <= '~'; });
}

[[nodiscard]] bool begin_frame(std::string_view name, ByteBuffer& out) noexcept {
  constexpr std::byte empty_head[kFrameHeadSize] = {};
  return name.size() <= kMaximumNameLength && is_printable(name) && out.append(empty_head, kFrameHeadSize) &&
         out.append(name);
}

// Fills in the head of the frame that begins at `start`, or takes the frame back when it is not complete.
[[nodiscard]] bool finish_frame(FrameKind kind, std::uint8_t flags, std::uint64_t serial, std::string_view name,
                                std::size_t start, bool complete, ByteBuffer& out) noexcept {
  if (!complete || out.size() - start - kFrameHeadSize > UINT32_MAX) {
    static_cast<void>(out.resize(start));
    return false;
  }
  std::byte* head = out.data() + start;
  write_big_endian(static_cast<std::uint32_t>(out.size() - start - kFrameHeadSize), head);
  head[4] = static_cast<std::byte>(kind);
  head[5] = static_cast<std::byte>(flags);
  write_big_endian(static_cast<std::uint16_t>(name.size()), head + 6);
  set_frame_serial({head, kFrameHeadSize}, serial);
  return true;
}

}  // namespace

FrameResult parse_frame(std::span<const std::byte> bytes, std::uint32_t maximum_body, Frame& frame) noexcept {
  if (bytes.size() < kFrameHeadSize) return FrameResult::incomplete;
  frame.head = read_head(bytes.data());
  if (!is_possible(frame.head, maximum_body)) return FrameResult::refused;
  bytes = bytes.subspan(kFrameHeadSize);
  if (bytes.size() < frame.head.body_length) return FrameResult::incomplete;
  frame.name = {reinterpret_cast<const char*>(bytes.data()), frame.head.name_length};
  frame.payload = bytes.subspan(frame.head.name_length, frame.head.body_length - frame.head.name_length);
  return is_printable(frame.name) ? FrameResult::complete : FrameResult::refused;
}

bool append_frame(FrameKind kind, std::uint8_t flags, std::uint64_t serial, std::string_view name,
                  const PropertyValue& value, ByteBuffer& out) noexcept {
  const std::size_t start = out.size();
  const bool complete = begin_frame(name, out) && (!value || write_binary(value, out));
  return finish_frame(kind, flags, serial, name, start, complete, out);
}

bool append_frame(FrameKind kind, std::uint8_t flags, std::uint64_t serial, std::string_view name,
                  const CheckedBytes& value, ByteBuffer& out) noexcept {
  const std::size_t start = out.size();
  const bool complete = begin_frame(name, out) && out.append(value.bytes().data(), value.bytes().size());
  return finish_frame(kind, flags, serial, name, start, complete, out);
}

void set_frame_serial(std::span<std::byte> frame, std::uint64_t serial) noexcept {
  write_big_endian(serial, frame.data() + 8);
}

}  // namespace quorvel::wire
