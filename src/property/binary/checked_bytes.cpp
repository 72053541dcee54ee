// The check is a walk over the objects in the order of their numbers. A container may only refer to containers with
// higher numbers, and each is referred to once, so nothing contains itself, nothing repeats, and the depth of a
// container is known before the walk reaches it.

#include "property/binary/checked_bytes.h"

#include <cstdlib>
#include <string_view>

#include "property/binary/object_walk.h"
#include "property/limits.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

// The sink of a walk that keeps nothing but the containers' depths.
class Checker {
 public:
  explicit Checker(const BinaryLayout& layout) noexcept
      : layout_(layout), depths_(static_cast<std::uint16_t*>(std::calloc(layout.count(), sizeof(std::uint16_t)))) {}
  ~Checker() { std::free(depths_); }
  Checker(const Checker&) = delete;
  Checker& operator=(const Checker&) = delete;

  [[nodiscard]] bool check() noexcept {
    EncodedObject top;
    if (depths_ == nullptr || layout_.top() != 0) return false;
    if (!layout_.object_at(layout_.offset_of(0), top) || top.kind != format::kDictionary) return false;
    depths_[0] = 1;
    return walk_objects(layout_, *this);
  }

  struct ShortRun {
    [[nodiscard]] static bool has_room() noexcept { return true; }
    [[nodiscard]] static Chunk take(std::uint64_t, const ShortLeaf& leaf) noexcept {
      return gather_chunks(leaf.body, leaf.size, [](std::size_t, const Chunk&) {});
    }
  };
  [[nodiscard]] static ShortRun begin_run() noexcept { return {}; }
  static void end_run(const ShortRun&) noexcept {}
  [[nodiscard]] static bool accept_disorder() noexcept { return false; }
  [[nodiscard]] static bool add_leaf(std::uint64_t, const EncodedObject&, std::size_t) noexcept { return true; }

  [[nodiscard]] bool add_container(std::uint64_t number, const EncodedObject& object) noexcept {
    if (depths_[number] == 0 || depths_[number] > kMaximumDepth) return false;
    const std::byte* at = object.body;
    if (object.kind == format::kDictionary && !check_keys(object, at)) return false;
    for (; at != object.end; at += layout_.reference_size()) {
      if (!check_element(number, layout_.reference_at(at))) return false;
    }
    return true;
  }

 private:
  // Moves `at` behind the keys.
  [[nodiscard]] bool check_keys(const EncodedObject& dictionary, const std::byte*& at) const noexcept {
    std::string_view before, key;
    for (std::uint64_t i = 0; i < dictionary.size; ++i, at += layout_.reference_size()) {
      const std::uint64_t reference = layout_.reference_at(at);
      if (reference >= layout_.count() || !find_ascii_text(layout_, layout_.offset_of(reference), key)) return false;
      if (i > 0 && !stands_before(before, key)) return false;
      before = key;
    }
    return true;
  }

  // An element that is a container by its marker gets its place in the tree; whether it is sound shows at its turn.
  [[nodiscard]] bool check_element(std::uint64_t parent, std::uint64_t reference) noexcept {
    if (reference >= layout_.count()) return false;
    const std::byte* marker = layout_.marker_at(layout_.offset_of(reference));
    if (marker == nullptr) return false;
    if (!is_container_kind(static_cast<std::uint8_t>(*marker) >> 4)) return true;
    if (reference <= parent || depths_[reference] != 0) return false;
    depths_[reference] = static_cast<std::uint16_t>(depths_[parent] + 1);
    return true;
  }

  const BinaryLayout& layout_;
  std::uint16_t* depths_;  // by the containers' numbers; 0 until one is referred to
};
static_assert(kMaximumDepth < UINT16_MAX, "a depth, and the one behind the deepest, fit their type");

}  // namespace

CheckedBytes CheckedBytes::check(ByteBuffer& bytes) noexcept {
  CheckedBytes checked;
  BinaryLayout layout;
  if (layout.parse(bytes.bytes()) && Checker(layout).check()) checked.bytes_ = std::move(bytes);
  return checked;
}

}  // namespace quorvel
