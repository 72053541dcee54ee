// Files that are broken in every way that can be thought of: each holds no value, or one that survives a round trip,
// and costs no more time and memory than its size explains.
#include <ctime>
#include <iostream>

#include "hardening/allocations.h"
#include "property/limits.h"
#include "support/figures.h"
#include "support/values.h"

namespace quorvel::test {

#if defined(NDEBUG) && !defined(__SANITIZE_ADDRESS__) && !defined(__SANITIZE_THREAD__)
constexpr double kSlowness = 1;
#else
constexpr double kSlowness = 30;
#endif

std::string number(std::uint64_t value, unsigned width) {
  std::string bytes;
  for (unsigned i = width; i-- > 0;) bytes += static_cast<char>(i < 8 ? value >> (8 * i) : 0);
  return bytes;
}

// A file around objects; every field may lie.
struct File {
  std::vector<std::string> objects;
  unsigned offset_size = 2, reference_size = 1;
  std::optional<std::uint64_t> count = {}, table = {};
  std::uint64_t top = 0;
  std::vector<std::uint64_t> offsets = {};  // of the first objects, in place of their own
  std::string behind = {};

  [[nodiscard]] std::string bytes() const {
    std::string file = "bplist00", entries;
    for (std::size_t i = 0; i < objects.size(); ++i) {
      entries += number(i < offsets.size() ? offsets[i] : file.size(), offset_size);
      file += objects[i];
    }
    const std::uint64_t end = file.size();
    file += entries + std::string(6, '\0') + number(offset_size, 1) + number(reference_size, 1);
    return file + number(count.value_or(objects.size()), 8) + number(top, 8) + number(table.value_or(end), 8) + behind;
  }
};

std::string object(unsigned marker, const std::string& body = {}) { return static_cast<char>(marker) + body; }

PropertyValue nested(std::size_t levels) {
  PropertyValue value = array({});
  while (--levels > 0) value = array({value});
  return value;
}

// `levels` arrays, each of which refers `width` times to the next.
File fan(std::size_t levels, unsigned width) {
  File file{{}, 4, 4};
  for (std::size_t i = 1; i <= levels; ++i) {
    file.objects.push_back(object(0xa0 + width));
    for (unsigned j = 0; j < width; ++j) file.objects.back() += number(i, 4);
  }
  file.objects.push_back(object(0xa0));
  return file;
}

std::vector<std::string> seeds() {
  const std::uint64_t borders[] = {0, 0xff, 0x100, 0xffff, 0x10000, 0xffffffff, INT64_MAX, 1ull << 63, UINT64_MAX};
  PropertyValue numbers = array(
      {-1, INT64_MIN, 1.5, -0.0, std::numeric_limits<double>::quiet_NaN(), PropertyValue::date(1e300), true, false});
  for (const std::uint64_t border : borders) EXPECT_TRUE(numbers.append(PropertyValue::unsigned_integer(border)));
  const PropertyValue texts = dictionary({{"umlaut \xc3\xa4", "\xf0\x9f\x98\x80 and more than fifteen"},
                                          {"long", std::string(300, 'x')},
                                          {"data", test::data(std::string(20, '\xff'))}});
  const PropertyValue deep = dictionary({{"a", array({texts, array({1}), dictionary({})})}, {"b", nested(4)}});
  File wide{{object(0xd2, number(1, 8) + number(2, 8) + number(3, 8) + number(1, 8)), object(0x51, "k"),
             object(0x62, number(0xd83dde00, 4)), object(0x14, number(7, 16))}};
  wide.offset_size = wide.reference_size = 8;
  const PropertyValue plain = dictionary(
      {{"list", array({1, 2.5, "text", true, dictionary({})})}, {"longer than fifteen", test::data("bytes")}});
  return {encoded(plain), encoded(numbers),      encoded(texts),   encoded(deep),
          wide.bytes(),   encoded(text("text")), fan(6, 3).bytes()};
}

std::vector<std::string> made_by_hand() {
  std::vector<File> files;
  const File sound{{object(0xa2, object(1, object(2))), object(0x51, "a"), object(0x10, object(7))}};
  std::vector<std::uint64_t> extremes = {0, 1, 2, 3, 4, 7, 8, 9, 11, 16, 20, 40, 255, UINT64_MAX - 1, UINT64_MAX};
  for (const unsigned bit : {31u, 32u, 61u, 62u, 63u})
    for (const std::uint64_t less : {2u, 1u, 0u}) extremes.push_back((1ull << bit) - less);
  const auto vary = [&](auto field, std::uint64_t value) {
    files.push_back(sound);
    field(files.back(), value);
  };
  for (const std::uint64_t extreme : extremes) {
    vary([](File& file, std::uint64_t value) { file.offset_size = value & 0xff; }, extreme);
    vary([](File& file, std::uint64_t value) { file.reference_size = value & 0xff; }, extreme);
    vary([](File& file, std::uint64_t value) { file.count = value; }, extreme);
    vary([](File& file, std::uint64_t value) { file.top = value; }, extreme);
    vary([](File& file, std::uint64_t value) { file.table = value; }, extreme);
    vary([](File& file, std::uint64_t value) { file.offsets = {8, value}; }, extreme);
    for (const unsigned kind : {0x4fu, 0x5fu, 0x6fu, 0xafu, 0xdfu}) {
      for (const unsigned width : {1u, 2u, 4u, 8u, 16u, 32u}) {
        const unsigned marker = 0x10u + static_cast<unsigned>(std::countr_zero(width));
        files.push_back({{object(kind, object(marker, number(extreme, width))), object(0x51, "a")}});
      }
    }
    files.push_back({{object(0x14, number(extreme, 16))}});
    files.push_back({{object(0x14, number(UINT64_MAX, 8) + number(extreme, 8))}});
    for (const unsigned marker : {0x23u, 0x33u}) files.push_back({{object(marker, number(extreme, 8))}});
  }
  for (unsigned marker = 0; marker < 256; ++marker) {
    files.push_back({{object(marker, std::string(32, '\1')), object(0x51, "a")}});
    files.push_back({{object(0x5f, object(marker, number(1, 1) + "a"))}});  // a length marker followed by it
    files.push_back({{object(0xd1, object(1, object(2))), object(marker, "aaaaaaaa"), object(9)}});  // it as a key
    files.push_back({{object(0xa1, object(marker)), object(0xa1, object(0))}});  // references to self and in cycles
    files.push_back({{object(0x61, object(marker, object(0)))}});                // every high half of a code unit
    files.push_back({{object(0x62, object(0xdc) + object(0) + object(marker) + object(0))}});
  }
  files.push_back({{object(0xd2, "\1\1\2\2"), object(0x51, "k"), object(9)}});  // the same key twice, one object
  files.push_back({{object(0xd2, "\1\2\3\3"), object(0x51, "k"), object(0x51, "k"), object(9)}});  // and two
  for (const char* behind : {"x", "bplist00"}) files.push_back({{object(9)}, 2, 1, {}, {}, 0, {}, behind});
  for (const std::size_t levels : {511u, 512u, 513u, 1'000'000u}) files.push_back(fan(levels, 1));
  for (const std::size_t levels : {2u, 12u, 18u, 19u, 20u, 60u, 500u}) files.push_back(fan(levels, 2));
  std::vector<std::string> result;
  for (const File& file : files) result.push_back(file.bytes());
  return result;
}

long processor_nanoseconds() {
  timespec now{};
  ::clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return now.tv_sec * 1'000'000'000 + now.tv_nsec;
}

struct Figures {
  std::size_t files = 0, values = 0, accepted = 0;
  double slowest = 0;  // of the time allowed
};

// The nanoseconds that reading takes, the better of a few tries: somebody else may have had the processor.
double reading_time(std::span<const std::byte> bytes, double allowed) {
  double best = 1e18;
  for (int tries = 0; tries < 5 && best > allowed; ++tries) {
    const long start = processor_nanoseconds();
    const PropertyValue value = read_binary(bytes, Mutability::immutable);
    best = std::min(best, static_cast<double>(processor_nanoseconds() - start));
  }
  return best;
}

void try_file(const std::string& file, Figures& figures) {
  const auto bytes = std::as_bytes(std::span(file));
  const auto size = static_cast<double>(file.size());
  const long blocks = allocations::blocks(), before = allocations::bytes();
  allocations::forget_peak();
  const double allowed = (1e6 + 100 * size) * kSlowness;
  const double time = reading_time(bytes, allowed);
  EXPECT_LE(time, allowed) << file.size() << " bytes";
  EXPECT_LE(static_cast<double>(allocations::peak_bytes() - before), 8e6 + 16 * size);
  for (const Mutability mutability : {Mutability::immutable, Mutability::mutable_containers})
    EXPECT_STREQ(round_trip_fault(bytes, mutability), nullptr);
  bool accepted = false;
  EXPECT_STREQ(check_fault(bytes, &accepted), nullptr);
  EXPECT_EQ(allocations::blocks(), blocks) << "leaked";
  figures.slowest = std::max(figures.slowest, time / allowed);
  figures.accepted += accepted ? 1 : 0;
  figures.values += read_binary(bytes, Mutability::immutable) ? 1 : 0;
  if (testing::Test::HasFailure()) FAIL() << testing::PrintToString(file.substr(0, 400));
  ++figures.files;
}

TEST(MalformedFiles, HoldNoValueOrASoundOneAtABoundedCost) {
  Figures figures;
  for (const std::string& seed : seeds()) {
    ASSERT_NO_FATAL_FAILURE(try_file(seed, figures));
    for (std::size_t i = 0; i < seed.size(); ++i) {
      ASSERT_NO_FATAL_FAILURE(try_file(seed.substr(0, i), figures));
      for (const int mask : {0x01, 0x02, 0x04, 0x08, 0x10, 0x20, 0x40, 0x80, 0xff}) {
        std::string flipped = seed;
        flipped[i] = static_cast<char>(flipped[i] ^ mask);
        ASSERT_NO_FATAL_FAILURE(try_file(flipped, figures));
      }
    }
  }
  for (const std::string& file : made_by_hand()) ASSERT_NO_FATAL_FAILURE(try_file(file, figures));
  tell_figure("malformed files", "5,000 files",
              std::to_string(figures.files) + " files, " + std::to_string(figures.values) + " with a value; slowest " +
                  std::to_string(static_cast<int>(figures.slowest * 100)) + " % of the time allowed",
              figures.files >= 5000);
  EXPECT_GE(figures.values, 500u);
  EXPECT_GE(figures.accepted, 100u);
  EXPECT_LE(figures.values, figures.files / 2);
}

}  // namespace quorvel::test
