// The nodes that values are made of. Private to this folder and the encoding; everybody else includes value.h.
// docs/memory-layout.md draws them.
//
// A leaf lies alone in one allocation and has a count of its own, or lies in a block with other leaves of the same file
// and shares the block's count; a static text has no count. Containers always have a count of their own.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string_view>

#include "property/hash.h"
#include "property/word.h"

namespace quorvel {

enum class Mutability : bool { immutable, mutable_containers };

enum class PropertyKind : std::uint8_t { none, boolean, integer, real, date, string, data, array, dictionary };

namespace detail {

/// Not constexpr: an expression that would call it at compile time does not compile, and the message names `why`.
inline void refuse_to_compile(const char* why) noexcept { static_cast<void>(why); }

enum NodeFlag : std::uint8_t {
  kInBlock = 1,         // `count` is the distance to the block's head in eight-byte steps
  kStatic = 2,          // never counted, never freed
  kMutable = 4,         // accepts changes
  kVerbatim = 8,        // a leaf whose bytes stand in a file as they are: every one but a text with a byte above 0x7f
  kInlineStorage = 16,  // a container whose first slots lie in its own allocation
};

struct Node {
  std::atomic<std::uint32_t> count;
  PropertyKind kind;
  std::uint8_t flags;
  std::uint16_t reserved;
};
static_assert(sizeof(Node) == 8);

// String, data, or a number that no word holds: a real, a date, or an integer outside the immediate range. The bytes
// follow directly; a number's are those that stand in a file, eight of them, or sixteen above the signed range.
struct BytesNode : Node {
  std::uint32_t length;
  [[nodiscard]] const char* bytes() const noexcept { return reinterpret_cast<const char*>(this) + kBytesOffset; }
  [[nodiscard]] char* bytes() noexcept { return reinterpret_cast<char*>(this) + kBytesOffset; }
  [[nodiscard]] std::string_view view() const noexcept { return {bytes(), length}; }
  static constexpr std::size_t kBytesOffset = 12;
  /// The memory for a leaf of `length` bytes. The first sixteen can always be read and written, so that a short text
  /// needs no copy byte by byte.
  [[nodiscard]] static constexpr std::size_t allocation(std::size_t length) noexcept {
    return kBytesOffset + (length < 20 ? 20 : length);
  }
};
static_assert(sizeof(BytesNode) == BytesNode::kBytesOffset);

// The head of a block of leaves that share one count.
struct Block {
  std::atomic<std::uint64_t> count;
  Block* previous;   // of the same reader, while it reads
  std::size_t size;  // in bytes, the head included
};

struct ContainerNode : Node {
  std::uint32_t used;      // slots in use, dead ones included
  std::uint32_t capacity;  // slots allocated
  void* storage;
};

struct ArrayNode : ContainerNode {
  ContainerNode* next;  // of those that wait for their release
  [[nodiscard]] Word* items() const noexcept { return static_cast<Word*>(storage); }
};

struct Entry {
  Word key;  // 0 in an entry that was removed
  Word value;
};

// One slot of a dictionary's index: the key's hash, and the entry's position plus one (0: free).
struct IndexSlot {
  std::uint32_t hash;
  std::uint32_t entry;
};

struct DictionaryNode : ContainerNode {
  union {
    IndexSlot* index;
    ContainerNode* next;  // of those that wait for their release, when the index is gone
  };
  std::uint32_t live;        // entries that are not dead
  std::uint32_t index_size;  // 0 while the dictionary is small enough to be scanned, else a power of two
  std::uint32_t ascending;   // this many slots from the first hold their keys in ascending order
  // The live entries in ascending order of their keys, noted when somebody asked for it and they do not stand so;
  // null until then, and again when a key comes or goes. Readers on several threads may note it at once.
  mutable std::atomic<std::uint32_t*> order;
  [[nodiscard]] Entry* entries() const noexcept { return static_cast<Entry*>(storage); }
};

[[nodiscard]] inline Node* node_of(Word word) noexcept { return reinterpret_cast<Node*>(word); }
[[nodiscard]] inline Block* block_of(const Node* node) noexcept {
  const std::size_t distance = node->count.load(std::memory_order_relaxed);
  return reinterpret_cast<Block*>(reinterpret_cast<std::uintptr_t>(node) - distance * 8);
}
[[nodiscard]] inline PropertyKind kind_of(Word word) noexcept {
  if (is_node(word)) return node_of(word)->kind;
  if (word == 0) return PropertyKind::none;
  return (word & kTagMask) == kBooleanTag ? PropertyKind::boolean : PropertyKind::integer;
}
[[nodiscard]] inline const BytesNode* bytes_of(Word word) noexcept {
  return static_cast<const BytesNode*>(node_of(word));
}
[[nodiscard]] inline std::string_view text_of(Word word) noexcept { return bytes_of(word)->view(); }
[[nodiscard]] inline Word word_of(const Node* node) noexcept { return reinterpret_cast<Word>(node); }
[[nodiscard]] inline const DictionaryNode& dictionary_at(Word word) noexcept {
  return *static_cast<const DictionaryNode*>(node_of(word));
}

/// Frees a node whose last reference is gone, and what only it referred to, without recursion.
void destroy(Node* node) noexcept;
void release_block(Block* block, std::uint64_t references) noexcept;

inline void retain(Word word) noexcept {
  if (!is_node(word)) return;
  Node* node = node_of(word);
  if ((node->flags & (kInBlock | kStatic)) == 0) {
    node->count.fetch_add(1, std::memory_order_relaxed);
  } else if ((node->flags & kInBlock) != 0) {
    block_of(node)->count.fetch_add(1, std::memory_order_relaxed);
  }
}

inline void release(Word word) noexcept {
  if (!is_node(word)) return;
  Node* node = node_of(word);
  if ((node->flags & (kInBlock | kStatic)) == 0) {
    if (node->count.fetch_sub(1, std::memory_order_acq_rel) == 1) destroy(node);
  } else if ((node->flags & kInBlock) != 0) {
    release_block(block_of(node), 1);
  }
}

/// Retains a run of words, counting a run of leaves of one block at once.
void retain_all(const Word* words, std::size_t count) noexcept;

/// A leaf of its own memory, with one reference, whose bytes the caller fills in; null when memory runs out or the
/// length reaches 4 GiB.
[[nodiscard]] BytesNode* new_bytes(PropertyKind kind, std::size_t length, std::uint8_t flags) noexcept;
/// Fills in the bytes of a number that no word holds, and returns its word; 0 for null.
[[nodiscard]] Word finish_number(BytesNode* node, std::uint64_t bits) noexcept;

/// The most slots of a container.
inline constexpr std::size_t kMaximumSlots = std::size_t{1} << 31;
/// An empty container with room for `capacity` slots in the same allocation, or null when memory runs out.
[[nodiscard]] ArrayNode* new_array(std::size_t capacity, std::uint8_t flags) noexcept;
[[nodiscard]] DictionaryNode* new_dictionary(std::size_t capacity, std::uint8_t flags) noexcept;
/// A mutable copy that shares its elements with the source, or null when memory runs out.
[[nodiscard]] DictionaryNode* copy_dictionary(const DictionaryNode& from) noexcept;

/// Doubles a container's room. False, and nothing changed, when memory runs out.
[[nodiscard]] bool grow_storage(ContainerNode& container, std::size_t slot_size) noexcept;
/// Makes the index large enough for `entries` entries. False, and nothing changed, when memory runs out.
[[nodiscard]] bool prepare_index(DictionaryNode& dictionary, std::uint32_t entries) noexcept;
/// The entry under `key`, or null.
[[nodiscard]] Entry* find_entry(const DictionaryNode& dictionary, const HashedKey& key) noexcept;
/// Adds an entry under a key that is not there yet, taking over both references. There must be room for it.
void add_entry(DictionaryNode& dictionary, const HashedKey& key, Word key_word, Word value) noexcept;

}  // namespace detail
}  // namespace quorvel
