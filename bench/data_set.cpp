#include "bench/data_set.h"

#include <algorithm>
#include <map>
#include <mutex>
#include <random>

namespace quorvel::bench {
namespace {

class Maker {
 public:
  DataSet make(std::size_t count) {
    DataSet entries;
    entries.reserve(count);
    for (std::size_t i = 0; i < count; ++i) {
      Entry entry;
      entry.domain = "com.Orvane.mobile.domain" + std::to_string(i / kKeysOfDomain);
      entry.key = "Key" + std::to_string(i % kKeysOfDomain);
      entry.store_key = entry.domain + '-' + entry.key;
      entry.value = value();
      entry.changed = entry.value;
      change(entry.changed);
      entries.push_back(std::move(entry));
    }
    std::shuffle(entries.begin(), entries.end(), random_);
    return entries;
  }

 private:
  std::uint64_t number(std::uint64_t low, std::uint64_t high) { return low + random_() % (high - low + 1); }

  std::string text() {
    const std::size_t length = number(4, 24);
    std::string made;
    if (number(1, 20) == 1) made = "\u00e9";
    while (made.size() < length) made += static_cast<char>('a' + number(0, 25));
    return made;
  }
  std::int64_t integer() {
    const std::uint64_t bits = number(1, 40);
    return static_cast<std::int64_t>(random_() & ((std::uint64_t{1} << bits) - 1)) * (number(0, 9) == 0 ? -1 : 1);
  }
  Bytes bytes() {
    Bytes made(32);
    for (std::uint8_t& byte : made) byte = static_cast<std::uint8_t>(random_());
    return made;
  }
  Value element() { return number(0, 1) == 0 ? Value{text()} : Value{integer()}; }
  Value nested() {
    const std::size_t count = number(4, 6);
    Array array;
    Dictionary dictionary;
    for (std::size_t i = 0; i < count; ++i) {
      array.push_back(element());
      dictionary.push_back({"Member" + std::to_string(i), element()});
    }
    return number(0, 1) == 0 ? Value{array} : Value{dictionary};
  }
  Value value() {
    const std::uint64_t share = number(1, 100);
    if (share <= 50) return {text()};
    if (share <= 70) return {integer()};
    if (share <= 80) return {number(0, 1) == 0};
    if (share <= 90) return {bytes()};
    if (share <= 95) return {Date{static_cast<double>(number(500'000'000, 800'000'000))}};
    return nested();
  }

  struct Change {
    void operator()(std::string& text) const { text.back() = text.back() == 'z' ? 'a' : 'z'; }
    void operator()(std::int64_t& number) const { ++number; }
    void operator()(bool& truth) const { truth = !truth; }
    void operator()(Bytes& bytes) const { bytes.back() ^= 1; }
    void operator()(Date& date) const { date.seconds += 1; }
    void operator()(Array& array) const { change(array.back()); }
    void operator()(Dictionary& dictionary) const { change(dictionary.back().value); }
  };
  static void change(Value& value) { std::visit(Change{}, value.content); }

  std::mt19937_64 random_{20'010'101};
};

}  // namespace

bool Value::operator==(const Value& other) const { return content == other.content; }

const DataSet& data_set(std::size_t count) {
  static std::map<std::size_t, DataSet> made;
  static std::mutex mutex;
  const std::lock_guard hold(mutex);
  const auto [place, is_new] = made.try_emplace(count);
  if (is_new) place->second = Maker().make(count);
  return place->second;
}

}  // namespace quorvel::bench
