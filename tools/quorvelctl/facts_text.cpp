#include "facts_text.h"

#include <algorithm>

#include "common/failure.h"
#include "common/human_text.h"

namespace quorvel::tools {
namespace {

constexpr std::size_t kIndent = 2;
constexpr std::size_t kGap = 2;
constexpr std::size_t kLongestBeside = 24;

// A text that has a unit, such as an address, is of that kind to people.
std::string source_of(const LiveAnswer& fact) {
  const std::string kind(fact.value.is_string() && !fact.unit.empty() ? fact.unit : kind_name(fact.value.kind()));
  return fact.origin.empty() ? kind : kind + ", " + displayable(fact.origin);
}

struct Columns {
  std::size_t value;
  std::size_t source;  // behind the value, if that leaves room
  std::size_t below;   // otherwise on a line of its own
  bool one_line;       // sources stand beside values, but for values that are too long
};

// Sources stand in one column behind the values, or all of them below, in the values' column if that leaves room.
Columns columns_for(const std::vector<LiveAnswer>& facts, std::size_t width) {
  std::size_t key = 0, value = 0, source = 0;
  for (const LiveAnswer& fact : facts) {
    const std::size_t columns = columns_of(value_text(fact));
    key = std::max(key, fact.row->key.size());
    if (fact.value) source = std::max(source, columns_of(source_of(fact)));
    if (columns <= kLongestBeside) value = std::max(value, columns);
  }
  const std::size_t start = kIndent + key + kGap;
  const std::size_t source_start = start + value + kGap;
  return {start, source_start, start + source <= width ? start : 2 * kIndent, source_start + source <= width};
}

void append_fact(const LiveAnswer& fact, const Columns& columns, std::string& text) {
  const Palette& colours = palette();
  const std::string_view key = fact.row->key;
  const std::string value = value_text(fact);
  text.append(kIndent, ' ').append(colours.key).append(key).append(colours.reset);
  text.append(columns.value - kIndent - key.size(), ' ');
  text.append(fact.value ? std::string_view() : colours.quiet).append(value);
  const std::size_t end = columns.value + columns_of(value);
  if (!fact.value) {
    text.append(colours.reset).append("\n");
    return;
  }
  const std::string source = source_of(fact);
  if (columns.one_line && end + kGap <= columns.source) {
    text.append(columns.source - end, ' ');
  } else {
    text.append("\n").append(columns.below, ' ');
  }
  text.append(colours.quiet).append(source).append(colours.reset).append("\n");
}

}  // namespace

std::string_view kind_name(PropertyKind kind) {
  switch (kind) {
    case PropertyKind::none: return "none";
    case PropertyKind::boolean: return "boolean";
    case PropertyKind::integer: return "integer";
    case PropertyKind::real: return "real";
    case PropertyKind::date: return "date";
    case PropertyKind::string: return "text";
    case PropertyKind::data: return "data";
    case PropertyKind::array: return "array";
    case PropertyKind::dictionary: return "dictionary";
  }
  return "";
}

std::string value_text(const LiveAnswer& fact) {
  if (!fact.value) return "(no answer)";
  const bool measures = !fact.unit.empty() && !fact.value.is_string();
  return one_line(fact.value) + (measures ? " " + std::string(fact.unit) : "");
}

std::string facts_text(const std::vector<LiveAnswer>& facts, std::size_t width) {
  const Palette& colours = palette();
  const Columns columns = columns_for(facts, width);
  std::string text;
  std::string_view domain;
  for (std::size_t i = 0; i < facts.size(); ++i) {
    if (i == 0 || facts[i].row->domain != domain) {
      domain = facts[i].row->domain;
      text.append(i == 0 ? "" : "\n").append(colours.strong);
      text.append(domain.empty() ? "Without a domain" : domain).append(colours.reset).append("\n");
    }
    append_fact(facts[i], columns, text);
  }
  return text;
}

PropertyValue fact_value(const LiveAnswer& fact) {
  PropertyValue result = PropertyValue::dictionary(6);
  put(result, "key", PropertyValue::string(fact.row->key));
  if (!fact.row->domain.empty()) put(result, "domain", PropertyValue::string(fact.row->domain));
  if (!fact.value) return result;
  put(result, "value", fact.value);
  put(result, "kind", PropertyValue::string(kind_name(fact.value.kind())));
  if (!fact.unit.empty()) put(result, "unit", PropertyValue::string(fact.unit));
  if (!fact.origin.empty()) put(result, "origin", PropertyValue::string(fact.origin));
  return result;
}

}  // namespace quorvel::tools
