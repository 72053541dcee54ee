// The one walk over a file's objects, in the order of their numbers. The walk knows which objects are sound; a sink
// decides what becomes of them. Each sink is a template argument, so that walk and sink are compiled into one loop.
//
// A sink has
//
//   begin_run()           makes a run, which takes short leaves: a small object that the loop keeps in registers, with
//                           has_room()           whether it can take one more
//                           take(number, leaf)   takes a leaf, and returns all its chunks together
//   end_run(run)          takes the run back
//   accept_disorder()     tells whether the walk may go on at the first object that does not stand behind the one
//                         before it; asked once
//   add_leaf(number, object, length), add_container(number, object)
//                         takes any other object, which is sound; `length` is that of the leaf's bytes in memory
//
// each of which may end the walk by returning false. A text of a run is known to be sound when the run is over.
#pragma once

#include <cstdint>
#include <string_view>

#include "property/binary/layout.h"
#include "property/binary/short_leaf.h"

namespace quorvel::detail {

/// Whether an object that is no container is sound; `length` is then that of its text in UTF-8, or of its bytes.
[[nodiscard]] bool measure_leaf(const EncodedObject& leaf, std::size_t& length) noexcept;

/// Finds the bytes of a text that is marked as ASCII. Whether it is sound, a walk has to tell.
[[nodiscard]] bool find_ascii_text(const BinaryLayout& layout, std::uint64_t offset, std::string_view& text) noexcept;

/// Walks over short leaves, one behind the other from object `number` on, as long as each stands behind the one before;
/// moves `number` to the first other object and `end` to where the last leaf ended. False when a text is not sound.
template <class Sink>
[[nodiscard]] inline bool walk_short_leaves(const BinaryLayout& whole, Sink& sink, std::uint64_t& number,
                                            std::uint64_t& end) noexcept {
  // Stores of bytes may change any object that others can see: copies spare a reload after each.
  const BinaryLayout layout = whole;
  auto run = sink.begin_run();
  const std::uint64_t limit = layout.limit_of(kLargestShortObject);
  std::uint64_t behind = end, i = number, foreign = 0;
  for (; i < layout.count() && run.has_room(); ++i) {
    const std::uint64_t offset = layout.offset_of(i);
    ShortLeaf leaf;
    if (offset < behind || offset >= limit || !find_short_leaf(layout.at(offset), leaf)) break;
    foreign |= foreign_bits(leaf, run.take(i, leaf));
    behind = layout.offset_at(leaf.body + leaf.size);
  }
  sink.end_run(run);
  number = i;
  end = behind;
  return foreign == 0;
}

/// Walks over all objects of a file. False when one is not sound, or the sink ended the walk.
template <class Sink>
[[nodiscard]] inline bool walk_objects(const BinaryLayout& layout, Sink& sink) noexcept {
  bool in_order = true;
  std::uint64_t number = 0, end = binary_format::kHeader.size();
  for (;; ++number) {
    if (!walk_short_leaves(layout, sink, number, end)) return false;
    if (number == layout.count()) return true;
    EncodedObject object;
    const std::uint64_t offset = layout.offset_of(number);
    if (!layout.object_at(offset, object)) return false;
    if (in_order && offset < end) {
      if (!sink.accept_disorder()) return false;
      in_order = false;
    }
    end = layout.offset_at(object.end);
    std::size_t length = 0;
    if (object.is_container() ? !sink.add_container(number, object)
                              : !measure_leaf(object, length) || !sink.add_leaf(number, object, length)) {
      return false;
    }
  }
}

}  // namespace quorvel::detail
