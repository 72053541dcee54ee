// The paths without branches against their plain references, on random leaves.
#include <random>

#include "property/binary/leaf_reader.h"
#include "property/binary/leaf_writer.h"
#include "property/binary/object_walk.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

using namespace detail;

PropertyValue random_leaf(std::mt19937_64& random) {
  std::string bytes(random() % (kShortText + 4), '\0');
  for (char& byte : bytes) byte = static_cast<char>(random() & 0x7f);
  const std::uint64_t bits = random() >> (random() % 64);
  switch (random() % 7) {
    case 0: return PropertyValue::string(bytes);
    case 1: return test::data(bytes + static_cast<char>(random()));
    case 2: return PropertyValue::integer(static_cast<std::int64_t>(bits));
    case 3: return PropertyValue::integer(-static_cast<std::int64_t>(bits >> 1));
    case 4: return PropertyValue::unsigned_integer(bits);
    case 5: return PropertyValue::real(std::bit_cast<double>(bits));
    default: return PropertyValue::date(std::bit_cast<double>(bits));
  }
}

std::string put(std::byte* (*put_one)(std::byte*, Word), Word word) {
  // Exactly the room that a leaf is promised.
  std::vector<std::byte> room(leaf_room(word));
  const auto* end = put_one(room.data(), word);
  return {reinterpret_cast<const char*>(room.data()), static_cast<std::size_t>(end - room.data())};
}

// The word as a leaf that has its bytes, as the writer's loop sees it.
std::byte* put_fast(std::byte* at, Word word) {
  if (!is_node(word)) return put_short_leaf(at, IntegerLeaf(word));
  return is_short_leaf(*bytes_of(word)) ? put_short_leaf(at, *bytes_of(word)) : put_plain_leaf(at, word);
}
std::byte* put_plain(std::byte* at, Word word) { return is_node(word) ? put_plain_leaf(at, word) : put_leaf(at, word); }

TEST(Leaves, AreWrittenAlikeOnBothWays) {
  std::mt19937_64 random(1);
  for (int i = 0; i < 20'000; ++i) {
    const PropertyValue leaf = random_leaf(random);
    ASSERT_EQ(put(put_fast, leaf.word()), put(put_plain, leaf.word())) << described(leaf);
  }
}

// A file with one object, and so many unused bytes behind it: without any, the object is near the end.
std::string file_of(const std::string& object, std::size_t unused) {
  std::string file = "bplist00" + object + std::string(unused, '\0');
  const auto table = static_cast<char>(file.size());
  file += '\x8' + std::string(6, '\0') + "\1\1" + std::string(7, '\0') + '\1' + std::string(15, '\0');
  return file + table;
}

TEST(Leaves, AreReadAlikeOnBothWays) {
  std::mt19937_64 random(2);
  int values = 0;
  for (int i = 0; i < 40'000; ++i) {
    std::string object = put(put_plain, random_leaf(random).word());
    // A size or a byte that does not fit is refused on both ways.
    if (random() % 4 == 0) object[random() % object.size()] ^= static_cast<char>(1 << random() % 8);
    const std::string near = file_of(object, 0), far = file_of(object, 2 * kLargestShortObject);
    const PropertyValue plain = read_binary(std::as_bytes(std::span(near)), Mutability::immutable);
    const PropertyValue fast = read_binary(std::as_bytes(std::span(far)), Mutability::immutable);
    // An object that was made longer ends in the unused bytes of one file, and beyond the other.
    BinaryLayout layout;
    EncodedObject found;
    ASSERT_TRUE(layout.parse(std::as_bytes(std::span(far))));
    if (layout.object_at(8, found) && layout.offset_at(found.end) > 8 + object.size()) continue;
    ASSERT_EQ(plain, fast) << testing::PrintToString(object);
    values += plain ? 1 : 0;
  }
  EXPECT_GT(values, 30'000);
}

}  // namespace
}  // namespace quorvel::test
