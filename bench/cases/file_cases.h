// Saving and loading, for every contender alike. A contender is a class, made for a number of entries, with
//
//   save()     puts all of them into file() by way of a temporary name
//   load()     the values that file() holds
//   matches()  compares loaded values with the data
#pragma once

#include <optional>

#include "bench/cases/case.h"
#include "bench/support/files.h"

namespace quorvel::bench {

template <class Saver>
void save_case(benchmark::State& state, std::size_t entries) {
  auto& given = material<Saver>(entries);
  given.use();
  given.save();
  bool all_right = true;
  ino_t last = 0;
  for ([[maybe_unused]] auto iteration : state) {
    given.save();
    // Another file each time: the last one was there until it was replaced.
    const ino_t now = file_number(given.file());
    all_right &= now != last;
    last = now;
  }
  finish(state, entries, all_right && given.matches(given.load()));
}

template <class Saver>
void load_case(benchmark::State& state, std::size_t entries) {
  auto& given = material<Saver>(entries);
  given.use();
  given.save();
  bool all_right = true;
  for ([[maybe_unused]] auto iteration : state) {
    auto loaded = given.nothing();
    time_iteration(state, [&] { loaded = given.load(); });
    all_right &= given.looks_whole(loaded);
  }
  finish(state, entries, all_right && given.matches(given.load()));
}

template <class Saver>
bool register_files(std::size_t entries, std::string_view contender) {
  add_case("save", entries, contender, save_case<Saver>);
  add_case("load", entries, contender, load_case<Saver>)->UseManualTime();
  return true;
}

}  // namespace quorvel::bench
