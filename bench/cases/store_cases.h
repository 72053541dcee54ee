// The store's operations, for every contender alike. A contender is a class with
//
//   Name, Stored            a domain or key, and a value, as its operations take them; made before the clock runs
//   name(), stored()        make them; restored() turns a stored value back
//   prepare(domain, key)    makes ready for a new key what is not part of setting it
//   set, copy, exists, view the operations; view_size and view_finds look at a view
#pragma once

#include <algorithm>
#include <deque>
#include <memory>
#include <span>
#include <vector>

#include "bench/cases/case.h"
#include "bench/data_set.h"

namespace quorvel::bench {

template <class Store>
struct StoreItem {
  typename Store::Name domain;
  typename Store::Name key;
  typename Store::Name absent_key;
  typename Store::Stored original;
  typename Store::Stored equal;  // another object with the same content
  typename Store::Stored changed;
};

template <class Store>
struct StoreMaterial {
  explicit StoreMaterial(std::size_t entries) : data(data_set(entries)) {
    items.reserve(entries);
    for (const Entry& entry : data) {
      items.push_back({Store::name(entry.domain), Store::name(entry.key), Store::name("No" + entry.key),
                       Store::stored(entry.value), Store::stored(entry.value), Store::stored(entry.changed)});
    }
    fill(store);
  }

  void prepare(Store& empty) const {
    for (const auto& item : items) empty.prepare(item.domain, item.key);
  }
  bool set_originals(Store& target) const {
    bool all_right = true;
    for (const auto& item : items) all_right &= target.set(item.domain, item.key, item.original);
    return all_right;
  }
  void fill(Store& empty) const {
    prepare(empty);
    set_originals(empty);
  }
  [[nodiscard]] bool holds(const Store& target, std::size_t at, const Value& expected) const {
    return Store::restored(target.copy(items[at].domain, items[at].key)) == expected;
  }
  /// Looks at every entry of a small store and at some of a large one.
  [[nodiscard]] bool holds_originals(const Store& target) const {
    for (std::size_t at = 0; at < items.size(); at += 1 + items.size() / kSize) {
      if (!holds(target, at, data[at].value)) return false;
    }
    return true;
  }

  const DataSet& data;
  std::vector<StoreItem<Store>> items;
  Store store;
};

/// Calls `operation(store, item, pass)` for one item after the other; each thread has items of its own. `pass` counts
/// how often they were all done.
template <class Store, class Operation>
void walk_items(benchmark::State& state, StoreMaterial<Store>& given, Operation operation) {
  const auto step = static_cast<std::size_t>(state.threads());
  const auto first = static_cast<std::size_t>(state.thread_index());
  const std::size_t count = given.items.size();
  std::size_t at = first;
  unsigned pass = 0;
  bool all_right = true;
  for ([[maybe_unused]] auto iteration : state) {
    all_right &= operation(given.store, given.items[at], pass);
    at += step;
    if (at < count) continue;
    at = first;
    ++pass;
  }
  finish(state, 1, all_right);
}

template <class Store>
void set_equal_case(benchmark::State& state, std::size_t entries) {
  auto& given = material<StoreMaterial<Store>>(entries);
  // Never the very object that is stored: that would compare without a look at its content.
  walk_items(state, given, [](Store& store, const auto& item, unsigned pass) {
    return store.set(item.domain, item.key, pass % 2 == 0 ? item.equal : item.original);
  });
  if (state.thread_index() == 0 && !given.holds_originals(given.store)) state.SkipWithError("not what was set");
}

template <class Store>
void set_changed_case(benchmark::State& state, std::size_t entries) {
  auto& given = material<StoreMaterial<Store>>(entries);
  unsigned last_pass = 0;
  walk_items(state, given, [&](Store& store, const auto& item, unsigned pass) {
    last_pass = pass;
    return store.set(item.domain, item.key, pass % 2 == 0 ? item.changed : item.original);
  });
  const auto first = static_cast<std::size_t>(state.thread_index());
  if (!given.holds(given.store, first, last_pass % 2 == 0 ? given.data[first].changed : given.data[first].value)) {
    state.SkipWithError("not what was set");
  }
  // Each thread puts its own items back, for whoever comes next.
  for (std::size_t at = first; at < given.items.size(); at += static_cast<std::size_t>(state.threads())) {
    given.store.set(given.items[at].domain, given.items[at].key, given.items[at].original);
  }
}

template <class Store>
void copy_hit_case(benchmark::State& state, std::size_t entries) {
  auto& given = material<StoreMaterial<Store>>(entries);
  walk_items(state, given, [](const Store& store, const auto& item, unsigned) {
    return static_cast<bool>(store.copy(item.domain, item.key));
  });
  if (state.thread_index() == 0 && !given.holds_originals(given.store)) state.SkipWithError("not what is stored");
}

template <class Store>
void exists_miss_case(benchmark::State& state, std::size_t entries) {
  auto& given = material<StoreMaterial<Store>>(entries);
  walk_items(state, given, [](const Store& store, const auto& item, unsigned) {
    return !store.exists(item.domain, item.absent_key);
  });
}

/// From an empty store to a full one, growth included.
template <class Store>
void set_new_case(benchmark::State& state, std::size_t entries) {
  const auto& given = material<StoreMaterial<Store>>(entries);
  const std::size_t rounds = std::max<std::size_t>(1, kSize / entries);
  bool all_right = true;
  for ([[maybe_unused]] auto iteration : state) {
    std::deque<Store> stores(rounds);
    for (Store& store : stores) given.prepare(store);
    time_iteration(state, [&] {
      for (Store& store : stores) all_right &= given.set_originals(store);
    });
    all_right &= given.holds(stores.back(), entries - 1, given.data.back().value);
  }
  finish(state, rounds * entries, all_right);
}

template <class Store>
void view_case(benchmark::State& state, std::size_t entries) {
  auto& given = material<StoreMaterial<Store>>(entries);
  std::size_t at = 0;
  bool all_right = true;
  for ([[maybe_unused]] auto iteration : state) {
    const auto& item = given.items[at];
    const auto view = given.store.view(item.domain);
    all_right &= Store::view_size(view) == kKeysOfDomain && Store::view_finds(view, item.key);
    at = (at + 1) % given.items.size();
  }
  finish(state, 1, all_right);
}

template <class Store>
bool register_store() {
  using Case = void(benchmark::State&, std::size_t);
  constexpr struct {
    const char* work;
    Case* run;
  } kCases[] = {{"set equal", set_equal_case<Store>},
                {"set changed", set_changed_case<Store>},
                {"copy hit", copy_hit_case<Store>},
                {"exists miss", exists_miss_case<Store>},
                {"view", view_case<Store>}};
  for (const auto& [work, run] : kCases) add_case(work, kSize, Store::kName, run);
  for (const auto& [work, run] : std::span(kCases).first(3)) {
    add_case(std::string(work) + ", two threads", kSize, Store::kName, run)->Threads(2)->UseRealTime();
  }
  add_case("set new", kSize, Store::kName, set_new_case<Store>)->UseManualTime();
  preparations().push_back([] { static_cast<void>(material<StoreMaterial<Store>>(kSize)); });
  return true;
}

/// The other sizes: one iteration does each entry once or more.
template <class Store>
bool register_store_growth() {
  for (const std::size_t entries : kStoreGrowthSizes) {
    if (entries == kSize) continue;
    const auto passes = static_cast<benchmark::IterationCount>(std::max<std::size_t>(entries, 4 * kSize));
    add_case("set equal", entries, Store::kName, set_equal_case<Store>)->Iterations(passes);
    add_case("copy hit", entries, Store::kName, copy_hit_case<Store>)->Iterations(passes);
    add_case("set new", entries, Store::kName, set_new_case<Store>)->UseManualTime()->Iterations(1);
  }
  return true;
}

}  // namespace quorvel::bench
