// A log format and its arguments, matching or not. Of the input: a count, that many arguments as a type, a length and
// bytes, the room for the message, and the format.
#include <algorithm>
#include <bit>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "log/message.h"
#include "property/binary/binary.h"
#include "target.h"

namespace quorvel::fuzz {
namespace {

LogArgument keep(PropertyValue value, std::vector<PropertyValue>& kept) {
  kept.push_back(std::move(value));
  return kept.back();
}

LogArgument make_argument(Input& input, std::vector<PropertyValue>& kept) {
  const std::uint64_t type = input.number(1);
  Input content(input.take(input.number(2)));
  switch (type % 10) {
    case 0: return as_text(content.rest());
    case 1: return keep(read_binary(content.rest(), Mutability::immutable), kept);
    case 2: return keep(PropertyValue::string(as_text(content.rest())), kept);
    case 3: return keep(PropertyValue::date(std::bit_cast<double>(content.number(8))), kept);
    case 4: return keep(PropertyValue::data(content.rest()), kept);
    case 5: return static_cast<int>(content.number(4));
    case 6: return static_cast<long>(content.number(8));
    case 7: return static_cast<unsigned long>(content.number(8));
    case 8: return static_cast<char>(content.number(1));
    default: return reinterpret_cast<const void*>(content.number(8));
  }
}

}  // namespace

void run_once(Bytes bytes) {
  Input input(bytes);
  std::vector<PropertyValue> values;
  std::vector<LogArgument> arguments;
  for (std::uint64_t count = input.number(1) % 8; count > 0; --count) arguments.push_back(make_argument(input, values));
  const std::size_t size = input.number(2) % 4096;
  const std::string format(as_text(input.rest()));
  const auto room = std::make_unique<char[]>(size);
  TextSink sink({room.get(), size});
  static_cast<void>(format_message(format.c_str(), arguments, sink));
  const std::string_view message(room.get(), static_cast<std::size_t>(sink.position() - room.get()));
  // Formats are the daemon's own. With a sound one, whatever the arguments are, a message is one line of sound text.
  const auto is_control = [](char c) { return static_cast<unsigned char>(c) < ' ' || c == '\x7f'; };
  if (std::ranges::any_of(format, is_control) || !PropertyValue::string(format)) return;
  require(std::ranges::none_of(message, is_control), "an argument breaks its line");
  require(static_cast<bool>(PropertyValue::string(message)), "a message is no text");
}

}  // namespace quorvel::fuzz
