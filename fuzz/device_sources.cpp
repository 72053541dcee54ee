// The grammars of the small files that describe a machine: what is taken out of them is sound, and what is written as
// they have it is taken out again. Of the input: a name's length, the name, and the content.
#include <charconv>
#include <string>

#include "linux/device/sources/parsing.h"
#include "property/value.h"
#include "target.h"

namespace quorvel::fuzz {
namespace {

using namespace platform::host;

void check_text(std::string_view content) {
  const std::string_view text = first_text(content);
  require(
      text.empty() || (text.data() >= content.data() && text.data() + text.size() <= content.data() + content.size()),
      "a text lies elsewhere");
  require(first_text(text) == text, "a text has something to take off");
  require(static_cast<bool>(PropertyValue::string(text)), "a text that is none");
  for (const char c : text) require(static_cast<unsigned char>(c) >= ' ' && c != '\x7f', "a text with a control");
  static_cast<void>(is_junk(text));
}

template <typename Number, typename Parse>
void check_number(std::string_view text, const Parse& parse) {
  const std::optional<Number> number = parse(text);
  if (!number) return;
  require(parse(std::to_string(*number)) == number, "a number changes when it is written");
  require(text.find_first_not_of("+-0123456789abcdefABCDEFxX") == std::string_view::npos, "a number with other text");
}

void check_address(std::string_view text) {
  if (!is_network_address(text)) return;
  std::byte bytes[6];
  for (std::size_t i = 0; i < 6; ++i) {
    unsigned value = 0;
    std::from_chars(text.data() + 3 * i, text.data() + 3 * i + 2, value, 16);
    bytes[i] = static_cast<std::byte>(value);
  }
  char written[kAddressLength];
  write_address(bytes, written);
  require(std::string_view(written, sizeof written) == text, "an address changes when it is written");
}

void check_list(std::string_view list) {
  std::string joined;
  std::string_view rest = list, text;
  while (take_listed_text(rest, text)) {
    require(text.find('\0') == std::string_view::npos, "a listed text goes on behind its end");
    joined.append(text).append(1, '\0');
  }
  if (!list.ends_with('\0') && !list.empty()) joined.pop_back();
  require(joined == list, "a list loses something");
}

void check_assignment(std::string_view name, std::string_view content) {
  ByteBuffer value;
  const bool found = find_assignment(content, name, value);
  require(value.size() <= content.size(), "a value is longer than its file");
  require(found || value.size() == 0, "a value without an assignment");
  if (name.find('\n') != std::string_view::npos || name.find('=') != std::string_view::npos) return;
  const std::string line = std::string(name) + "=";
  require(!found || content.find(line) != std::string_view::npos, "an assignment from nowhere");
  // The last one counts, whatever stands before it.
  if (content.find_first_of("'\n") != std::string_view::npos) return;
  const std::string quoted = "other\n" + line + "1\n" + line + '\'' + std::string(content) + "'\n";
  require(find_assignment(quoted, name, value) && as_text(value.bytes()) == content, "a value changes");
}

void check_identifier(std::string_view content) {
  std::byte id[16];
  if (!parse_machine_id(content, id)) return;
  std::string text;
  for (const std::byte byte : id) {
    text += "0123456789abcdef"[std::to_integer<unsigned>(byte) >> 4];
    text += "0123456789abcdef"[std::to_integer<unsigned>(byte) & 15];
  }
  require(content.substr(0, 32) == text && content.size() <= 33, "an identifier changes");
}

}  // namespace

void run_once(Bytes bytes) {
  Input input(bytes);
  const std::string_view name = as_text(input.take(input.number(1) % 32));
  const std::string_view content = as_text(input.rest());
  check_text(content);
  check_number<std::int64_t>(content, parse_integer);
  check_number<std::uint64_t>(content, parse_chip_number);
  check_address(content);
  check_list(content);
  check_assignment(name, content);
  check_identifier(content);
  const bool has = has_line(content, name);
  require(!has || content.find(name) != std::string_view::npos, "a line from nowhere");
}

}  // namespace quorvel::fuzz
