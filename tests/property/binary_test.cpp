#include "property/binary/binary.h"

#include <cmath>

#include "property/binary/checked_bytes.h"
#include "property/limits.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

std::string bytes(std::string_view hex) {
  std::string result;
  for (std::size_t i = 0; i < hex.size(); ++i) {
    if (hex[i] == ' ') continue;
    if (hex[i] == '\'') {
      for (++i; hex[i] != '\''; ++i) result += hex[i];
      continue;
    }
    result += static_cast<char>(std::stoi(std::string(hex.substr(i, 2)), nullptr, 16));
    ++i;
  }
  return result;
}

// What the reader and the check say of a file must agree.
PropertyValue decoded(std::string_view file, Mutability mutability = Mutability::immutable) {
  EXPECT_STREQ(check_fault(std::as_bytes(std::span(file))), nullptr);
  return read_binary(std::as_bytes(std::span(file)), mutability);
}

bool passes_check(std::string_view file) {
  bool accepted = false;
  EXPECT_STREQ(check_fault(std::as_bytes(std::span(file)), &accepted), nullptr);
  return accepted;
}

// A file with one-byte widths around objects, the first of which is the top one.
std::string file_of(const std::vector<std::string>& objects) {
  std::string file = "bplist00", table;
  for (const std::string& object : objects) {
    table += static_cast<char>(file.size());
    file += bytes(object);
  }
  const auto table_offset = static_cast<char>(file.size());
  file += table + bytes("0000000000 00 01 01 00000000000000");
  file += static_cast<char>(objects.size());
  return file + bytes("0000000000000000 00000000000000") + table_offset;
}

// The object as the first value of a dictionary, far from the end of the file.
std::string file_with(std::string_view object) {
  return file_of({"d2 01 02 03 04", "51 'a'", "51 'b'", std::string(object),
                  "4f 10 34 'What stands far from the end is read in another way.'"});
}
PropertyValue dictionary_with(const PropertyValue& value) {
  return dictionary({{"a", value}, {"b", data("What stands far from the end is read in another way.")}});
}

TEST(Binary, WritesTheKnownBytes) {
  const struct {
    Value value;
    std::string objects;
  } cases[] = {
      {false, "08"},
      {true, "09"},
      {0, "10 00"},
      {255, "10 ff"},
      {256, "11 0100"},
      {65'536, "12 00010000"},
      {4'294'967'296, "13 0000000100000000"},
      {-1, "13 ffffffffffffffff"},
      {std::numeric_limits<std::int64_t>::min(), "13 8000000000000000"},
      {std::numeric_limits<std::uint64_t>::max(), "14 0000000000000000 ffffffffffffffff"},
      {1.5, "23 3ff8000000000000"},
      {PropertyValue::date(-0.5), "33 bfe0000000000000"},
      {data("\x01\x02"), "42 0102"},
      {"", "50"},
      {"fifteen letters", "5f 10 0f 'fifteen letters'"},
      {"\xc3\xa4\xf0\x9f\x98\x80", "63 00e4 d83d de00"},
      {array({}), "a0"},
      {dictionary({}), "d0"},
  };
  for (const auto& [value, objects] : cases) {
    EXPECT_EQ(encoded(value.value()), file_of({objects})) << objects;
    EXPECT_EQ(decoded(file_of({objects})), value.value()) << objects;
    EXPECT_EQ(decoded(file_with(objects)), dictionary_with(value.value())) << objects;
  }
  const PropertyValue nested = dictionary({{"b", array({"a", "b", true, true})}, {"a", 1}});
  EXPECT_EQ(encoded(nested), file_of({"d2 01 02 03 04", "51 'a'", "51 'b'", "10 01", "a4 01 02 05 05", "09"}));
}

TEST(Binary, ReadsWhatOtherWritersMayChoose) {
  // A 16-byte integer that fits eight, a four-byte real, ASCII in UTF-16, objects out of order, wide references.
  EXPECT_EQ(decoded(file_of({"14 ffffffffffffffff ffffffffffffff00"})), PropertyValue::integer(-256));
  EXPECT_EQ(decoded(file_of({"22 3fc00000"})), PropertyValue::real(1.5));
  EXPECT_EQ(encoded(decoded(file_of({"62 0061 0062"}))), file_of({"52 'ab'"}));
  EXPECT_EQ(decoded(bytes("'bplist00' 09 a1 0001 09 08 0000000000 00 01 02 0000000000000002 0000000000000000 "
                          "000000000000000c")),
            array({true}));
}

TEST(Binary, RefusesWhatIsNoPropertyList) {
  std::istringstream single_objects(
      "00;0f;0a;15 00;24 00;30;34;71 00;80 00;90;b0;c0;e0;f0;14 0000000000000001 0000000000000000;"
      "14 ffffffffffffffff 0000000000000000;51 80;5f;5f 50;5f 13 ffffffffffffffff;"
      "5f 14 00000000000000000000000000000001;5f 10 ff;4f 13 7fffffffffffffff;61 d800;61 dc00;62 dc00 d800;"
      "62 d800 0041;62 0041;a1 00;a1 05;d1 00 00;af 13 2000000000000000;df 13 7fffffffffffffff;23 00000000;33 00");
  for (std::string object; std::getline(single_objects, object, ';');)
    EXPECT_FALSE(decoded(file_of({object})) || decoded(file_with(object))) << object;
  EXPECT_FALSE(decoded(file_of({"a1 01", "a1 00"}))) << "a cycle";
  EXPECT_FALSE(decoded(file_of({"d1 01 02", "10 01", "09"}))) << "a key that is no text";
  EXPECT_FALSE(decoded(file_of({"d2 01 02 03 03", "51 'a'", "51 'a'", "09"}))) << "a key twice";
  EXPECT_FALSE(decoded(file_of({"09"}) + "x"));
  for (std::size_t length = 1; length <= 60; ++length) {
    const std::string valid = encoded(dictionary_with(text(std::string(length, 'x'))));
    for (std::size_t at = valid.find('x'); valid[at] == 'x'; ++at) {
      std::string file = valid;
      file[at] = '\x80';
      EXPECT_FALSE(decoded(file)) << at << " of " << length;
    }
  }
  // With unused bytes between the last object and the table, no object is near the end.
  const std::string unused(60, '\0');
  const std::string far_table = file_of({"d1 01 02", "51 'a'", "52 fffe"});
  std::string spaced = far_table.substr(0, 16) + unused + far_table.substr(16);
  spaced.back() = static_cast<char>(spaced.back() + 60);
  EXPECT_FALSE(decoded(spaced));
  std::string long_text = encoded(text(std::string(5000, 'a')));
  long_text[4000] = '\x80';
  EXPECT_FALSE(decoded(long_text));
  EXPECT_FALSE(
      decoded(bytes("'bplist00' 0000000000000000 5f 10 0000000000 00 01 01 0000000000000001 0000000000000000"
                    "0000000000000011")))
      << "a size that stands in the offset table";
  EXPECT_FALSE(
      decoded(bytes("'bplist00' a1 01 09 08 08 0a 0b00000000 00 01 01 0000000000000003 0000000000000000"
                    "000000000000000c")))
      << "an offset that stands in the trailer";
  const std::string valid = file_of({"a2 01 02", "51 'a'", "10 05"});
  for (const int width : {0, 9, 255}) {
    for (const std::size_t at : {26u, 25u}) {
      std::string file = valid;
      file[file.size() - at] = static_cast<char>(width);
      EXPECT_FALSE(decoded(file)) << width;
    }
  }
  std::string overlapping = valid;
  overlapping[overlapping.size() - 32 - 1] = 9;  // object 2 begins within object 0
  EXPECT_FALSE(decoded(overlapping));
}

TEST(Binary, EqualValuesGiveEqualBytes) {
  PropertyValue up = PropertyValue::dictionary(), down = PropertyValue::dictionary();
  for (int i = 0; i < 500; ++i) {
    ASSERT_TRUE(up.set("key" + std::to_string(i), PropertyValue::integer(i)));
    ASSERT_TRUE(down.set("key" + std::to_string(499 - i), PropertyValue::integer(499 - i)));
    ASSERT_TRUE(down.set("gone" + std::to_string(i), PropertyValue::integer(i)));
  }
  for (int i = 0; i < 500; ++i) EXPECT_TRUE(down.remove("gone" + std::to_string(i)));
  EXPECT_EQ(up, down);
  // Entries that were removed do not count among those that make a dictionary large, behind enough other values.
  PropertyValue others = PropertyValue::array(), same = PropertyValue::dictionary(),
                shrunk = PropertyValue::dictionary();
  for (int i = 0; i < 600; ++i) {
    ASSERT_TRUE(others.append(PropertyValue::integer(i)));
    ASSERT_TRUE(shrunk.set(std::to_string(i), PropertyValue::integer(i % 200)));
  }
  for (int i = 200; i < 600; ++i) EXPECT_TRUE(shrunk.remove(std::to_string(i)));
  for (int i = 0; i < 200; ++i) ASSERT_TRUE(same.set(std::to_string(i), PropertyValue::integer(i)));
  EXPECT_EQ(encoded(array({others, shrunk})), encoded(array({others, same})));
  EXPECT_EQ(encoded(up), encoded(down));
  EXPECT_EQ(encoded(decoded(encoded(up))), encoded(up));
}

TEST(Binary, ReferencesAreAsSmallAsTheyCanBe) {
  const auto flags = [](int entries) {
    PropertyValue value = PropertyValue::dictionary();
    for (int i = 0; i < entries; ++i) EXPECT_TRUE(value.set(std::to_string(i), PropertyValue::boolean(true)));
    return value;
  };
  const auto numbers = [](int count) {
    PropertyValue value = PropertyValue::array();
    for (int i = 0; i < count; ++i) EXPECT_TRUE(value.append(PropertyValue::integer(i)));
    return array({value});
  };
  const std::tuple<PropertyValue, int> cases[] = {{flags(254), 1},      {flags(255), 2},     {flags(40'000), 2},
                                                  {flags(65'535), 4},   {numbers(254), 1},   {numbers(255), 2},
                                                  {numbers(65'534), 2}, {numbers(65'535), 4}};
  for (const auto& [value, size] : cases) {
    const std::string file = encoded(value);
    EXPECT_EQ(file[file.size() - 25], size);
    EXPECT_EQ(decoded(file), value);
  }
}

PropertyValue nested(std::size_t levels) {
  PropertyValue value = PropertyValue::boolean(true);
  for (std::size_t i = 0; i < levels; ++i) value = array({value});
  return value;
}

TEST(Binary, BoundsHoldForReaderAndWriterAlike) {
  ByteBuffer out;
  EXPECT_TRUE(write_binary(nested(kMaximumDepth), out));
  EXPECT_TRUE(read_binary(out.bytes(), Mutability::immutable));
  const std::size_t size = out.size();
  EXPECT_FALSE(write_binary(nested(kMaximumDepth + 1), out));
  EXPECT_FALSE(write_binary(nested(1'000'000), out));
  EXPECT_EQ(out.size(), size);
  std::string deep = encoded(dictionary({{"a", nested(kMaximumDepth - 1)}}));
  EXPECT_TRUE(passes_check(deep) && decoded(deep));
  char& deepest =
      deep[static_cast<unsigned char>(deep[deep.size() - 2]) * 256u + static_cast<unsigned char>(deep.back()) - 1];
  ASSERT_EQ(deepest, '\x09');
  deepest = '\xa0';  // an empty array
  EXPECT_FALSE(passes_check(deep) || decoded(deep));

  PropertyValue fan = array({true});
  for (int i = 0; i < 30; ++i) fan = array({fan, fan});
  EXPECT_FALSE(write_binary(fan, out));
  PropertyValue other = array({true});
  for (int i = 0; i < 30; ++i) other = array({other, other});
  EXPECT_FALSE(fan == other) << "ends, without an answer it could not check";

  PropertyValue wide = PropertyValue::array();
  for (int i = 0; i < 1'500'000; ++i) ASSERT_TRUE(wide.append(PropertyValue::integer(i % 7)));
  out.clear();
  ASSERT_TRUE(write_binary(wide, out)) << "what stands there is no repetition";
  EXPECT_EQ(read_binary(out.bytes(), Mutability::immutable), wide);
}

TEST(Binary, TheCheckAcceptsCommonLayouts) {
  EXPECT_TRUE(passes_check(encoded(dictionary({{"a", array({1, "x"})}, {"b", dictionary({})}, {"c", 2.5}}))));
  const std::vector<std::string> others[] = {
      {"a0"},                                        // no dictionary
      {"a1 01", "d0"},                               // nor here on top
      {"d2 01 02 03 03", "51 'b'", "51 'a'", "09"},  // keys out of order
      {"d1 01 02", "61 00e4", "09"},                 // or not ASCII
      {"d2 01 02 03 03", "51 'a'", "51 'b'", "a0"},  // a shared container
      {"d1 01 03", "51 'a'", "a0", "a1 02"},         // a container before its parent
  };
  for (const auto& objects : others) {
    EXPECT_FALSE(passes_check(file_of(objects))) << objects[0];
    EXPECT_TRUE(decoded(file_of(objects))) << objects[0];
  }
  // Thirty levels that each refer twice to the next stand for a thousand million values.
  std::vector<std::string> fan;
  for (int level = 1; level <= 30; ++level) {
    char object[32];
    std::snprintf(object, sizeof object, "d2 1f 20 %02x %02x", level, level);
    fan.emplace_back(object);
  }
  fan.insert(fan.end(), {"d0", "51 'a'", "51 'b'"});
  EXPECT_FALSE(passes_check(file_of(fan)));
  EXPECT_FALSE(decoded(file_of(fan)));
}

TEST(Binary, MutabilityIsThatOfTheRead) {
  const std::string file = encoded(dictionary({{"inner", dictionary({{"list", array({1})}})}, {"text", "t"}}));
  PropertyValue fixed = decoded(file), open = decoded(file, Mutability::mutable_containers);
  EXPECT_FALSE(fixed.set("new", PropertyValue::boolean(true)));
  EXPECT_FALSE(fixed.remove("text"));
  EXPECT_EQ(fixed.slot("inner"), nullptr);
  PropertyValue* inner = open.slot("inner");
  ASSERT_NE(inner, nullptr);
  PropertyValue* list = inner->slot("list");
  ASSERT_NE(list, nullptr);
  EXPECT_TRUE(list->append(PropertyValue::integer(2)));
  EXPECT_TRUE(open.remove("text"));
  EXPECT_EQ(open, dictionary({{"inner", dictionary({{"list", array({1, 2})}})}}));
  EXPECT_EQ(fixed, decoded(file));
}

}  // namespace
}  // namespace quorvel::test
