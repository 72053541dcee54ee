#include "wire/frame.h"

#include <algorithm>

#include "property/binary/binary.h"
#include "target.h"

namespace quorvel::fuzz {
namespace {

using wire::FrameResult;

void check_complete(Bytes input, std::uint32_t maximum, const wire::Frame& frame) {
  const std::size_t size = wire::kFrameHeadSize + frame.head.body_length;
  require(size <= input.size() && frame.head.body_length <= maximum, "a frame exceeds its limit or its bytes");
  require(frame.name.size() + frame.payload.size() == frame.head.body_length, "a body is not name and payload");
  require(frame.payload.data() + frame.payload.size() == input.data() + size, "a payload lies elsewhere");
  wire::Frame part;
  require(wire::parse_frame(input.first(size - 1), maximum, part) == FrameResult::incomplete, "a part is a whole");
  const PropertyValue value = read_binary(frame.payload, Mutability::immutable);
  if (!value && !frame.payload.empty()) return;
  ByteBuffer out;
  require(wire::append_frame(frame.head.kind, frame.head.flags, frame.head.serial, frame.name, value, out) &&
              wire::parse_frame(out.bytes(), UINT32_MAX, part) == FrameResult::complete,
          "a frame cannot be sent on");
  require(part.name == frame.name && part.head.serial == frame.head.serial && part.head.flags == frame.head.flags &&
              part.head.kind == frame.head.kind,
          "a frame changes when it is sent on");
}

}  // namespace

void run_once(Bytes input) {
  constexpr std::uint32_t kLimits[] = {0, 16, 4096, 1u << 20, 256u << 20, UINT32_MAX};
  for (const std::uint32_t maximum : kLimits) {
    Bytes rest = input;
    wire::Frame frame;
    while (wire::parse_frame(rest, maximum, frame) == FrameResult::complete) {
      check_complete(rest, maximum, frame);
      rest = rest.subspan(wire::kFrameHeadSize + frame.head.body_length);
    }
  }
}

}  // namespace quorvel::fuzz
