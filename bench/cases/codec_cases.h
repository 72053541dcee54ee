// Encoding, decoding and releasing, for every contender alike. A small collection is done as often as it takes to do as
// many entries as the large one, so that the clock counts the same work.
#pragma once

#include <malloc.h>

#include <algorithm>
#include <cstring>
#include <optional>
#include <span>
#include <vector>

#include "bench/cases/case.h"
#include "bench/data_set.h"

namespace quorvel::bench {

/// What is encoded was decoded before, by every contender: values that a file was read into, as a program holds them.
template <class Codec>
struct CodecMaterial {
  explicit CodecMaterial(std::size_t entries)
      : data(data_set(entries)),
        rounds(std::max<std::size_t>(1, kSize / entries)),
        encoded(Codec::encode(Codec::make(data))),
        decoded(Codec::decode(bytes())) {}

  [[nodiscard]] std::span<const std::byte> bytes() const { return Codec::bytes(encoded); }
  [[nodiscard]] bool decodes(const typename Codec::Encoded& again) const {
    return Codec::matches(Codec::decode(Codec::bytes(again)), data);
  }

  const DataSet& data;
  std::size_t rounds;
  typename Codec::Encoded encoded;
  typename Codec::Decoded decoded;
};

template <class Codec>
void encode_case(benchmark::State& state, std::size_t entries) {
  const auto& given = material<CodecMaterial<Codec>>(entries);
  std::optional<typename Codec::Encoded> last;
  bool all_right = true;
  for ([[maybe_unused]] auto iteration : state) {
    for (std::size_t round = 0; round < given.rounds; ++round) {
      last.emplace(Codec::encode(given.decoded));
      all_right &= Codec::bytes(*last).size() == given.bytes().size();
    }
  }
  finish(state, given.rounds * entries, all_right && last && given.decodes(*last));
}

/// As many entries as a reply of 1 KiB has.
inline constexpr std::size_t kReplyEntries = 18;

/// Every time into the same buffer, as a thread of the daemon encodes its replies.
template <class Codec>
void encode_again_case(benchmark::State& state, std::size_t entries) {
  const auto& given = material<CodecMaterial<Codec>>(entries);
  typename Codec::Encoded used = Codec::encode(given.decoded);
  bool all_right = true;
  for ([[maybe_unused]] auto iteration : state) {
    for (std::size_t round = 0; round < given.rounds; ++round) {
      Codec::encode_again(given.decoded, used);
      all_right &= Codec::bytes(used).size() == given.bytes().size();
    }
  }
  finish(state, given.rounds * entries, all_right && given.decodes(used));
}

template <class Codec>
bool register_encode_again() {
  add_case("encode again", kReplyEntries, Codec::kName, encode_again_case<Codec>);
  return true;
}

/// Times either the making of the values or their end.
enum class Half { decode, release };

template <class Codec, Half half>
void decode_case(benchmark::State& state, std::size_t entries) {
  const auto& given = material<CodecMaterial<Codec>>(entries);
  std::vector<typename Codec::Decoded> made;
  made.reserve(given.rounds);
  const auto decode = [&] {
    for (std::size_t round = 0; round < given.rounds; ++round) made.push_back(Codec::decode(given.bytes()));
  };
  bool all_right = true;
  for ([[maybe_unused]] auto iteration : state) {
    if constexpr (half == Half::decode) {
      time_iteration(state, decode);
    } else {
      decode();
    }
    for (const auto& value : made) all_right &= Codec::size(value) == entries;
    if constexpr (half == Half::release) {
      time_iteration(state, [&] { made.clear(); });
    } else {
      made.clear();
    }
  }
  finish(state, given.rounds * entries, all_right && given.decodes(given.encoded));
}

/// Bytes of heap that an entry takes once it is decoded, told as nanoseconds: a case can report nothing but time.
template <class Codec>
void heap_case(benchmark::State& state, std::size_t entries) {
  const auto& given = material<CodecMaterial<Codec>>(entries);
  std::vector<typename Codec::Decoded> made;
  made.reserve(given.rounds);
  const auto in_use = [] {
    const struct mallinfo2 info = ::mallinfo2();
    return static_cast<double>(info.uordblks + info.hblkhd);
  };
  for ([[maybe_unused]] auto iteration : state) {
    const double before = in_use();
    for (std::size_t round = 0; round < given.rounds; ++round) made.push_back(Codec::decode(given.bytes()));
    state.SetIterationTime((in_use() - before) * 1e-9);
  }
  finish(state, given.rounds * entries, Codec::matches(made.back(), given.data));
}

template <class Codec>
bool register_codec(std::size_t entries) {
  add_case("encode", entries, Codec::kName, encode_case<Codec>);
  add_case("decode", entries, Codec::kName, decode_case<Codec, Half::decode>)->UseManualTime();
  add_case("heap", entries, Codec::kName, heap_case<Codec>)->UseManualTime()->Iterations(1)->Repetitions(3);
  return true;
}

template <class Codec>
bool register_release(std::size_t entries) {
  add_case("release", entries, Codec::kName, decode_case<Codec, Half::release>)->UseManualTime();
  return true;
}

}  // namespace quorvel::bench
