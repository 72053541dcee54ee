#include "store/live_answers.h"

#include "files/value_helpers.h"

namespace quorvel {

namespace {

// Every read of a stored key has to learn first that no row answers it. So rows are found by a cheap sum of a key's
// length and a few characters: each sum has a chain of rows, in table order, linked when the program is compiled. A
// search in sorted rows would cost such a read 37 ns more, a half of what it takes; the hash of the store key costs as
// much as the sum, but differs in each process, so that its table would have to be made at each start.
constexpr std::size_t kChains = 256;
constexpr std::uint8_t kEnd = 0xff;

constexpr std::size_t chain_of(std::string_view key) noexcept {
  if (key.empty()) return 0;
  const auto at = [key](std::size_t i) { return static_cast<std::size_t>(static_cast<unsigned char>(key[i])); };
  return (key.size() * 7 + at(0) * 31 + at(key.size() / 2) * 3 + at(key.size() - 1) * 11) % kChains;
}

struct Chains {
  std::array<std::uint8_t, kChains> first;
  std::array<std::uint8_t, kLiveAnswers.size()> next;
};

consteval Chains link_rows() {
  Chains chains{};
  chains.first.fill(kEnd);
  for (std::size_t row = kLiveAnswers.size(); row-- > 0;) {
    const std::size_t chain = chain_of(kLiveAnswers[row].key);
    chains.next[row] = chains.first[chain];
    chains.first[chain] = static_cast<std::uint8_t>(row);
  }
  return chains;
}

constexpr Chains kRows = link_rows();

}  // namespace

const larry_info* find_live_answer(const PropertyValue& domain, const PropertyValue& key) noexcept {
  const PropertyValue& domain_text = as_string(domain);
  const PropertyValue& key_text = as_string(key);
  if (!key_text) return nullptr;
  for (std::uint8_t row = kRows.first[chain_of(key_text.text())]; row != kEnd; row = kRows.next[row]) {
    const larry_info& candidate = kLiveAnswers[row];
    if (candidate.key != key_text.text()) continue;
    // An empty domain is a domain: only a read without any matches a row without one.
    const bool both_absent = candidate.domain.empty() && !domain_text;
    const bool both_equal = !candidate.domain.empty() && domain_text && candidate.domain == domain_text.text();
    if (both_absent || both_equal) return &candidate;
  }
  return nullptr;
}

PropertyValue larry_lookup(const PropertyValue& domain, const PropertyValue& key, int column) noexcept {
  const larry_info* row = find_live_answer(domain, key);
  if (row == nullptr) return nullptr;
  if (column == 0) return PropertyValue::string(row->question);
  if (column != 1) return nullptr;
  return row->question_name.empty() ? PropertyValue::joined_string(kQuestionNamePrefix, row->question)
                                    : PropertyValue::string(row->question_name);
}

}  // namespace quorvel
