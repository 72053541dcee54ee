#include "words.h"

namespace quorvel::tools {
namespace {

bool needs_mark(const std::string& word) {
  if (word.empty()) return false;
  if (word[0] == '-') return word.size() > 1 && word[1] >= '0' && word[1] <= '9';
  return word[0] == '{' || word[0] == '[' || word[0] == kMark;
}

}  // namespace

std::vector<std::string> marked_words(int count, char** words) {
  std::vector<std::string> marked;
  for (int i = count - 1; i > 0; --i) {
    std::string word = words[i];
    if (needs_mark(word)) word.insert(word.begin(), kMark);
    marked.push_back(std::move(word));
  }
  return marked;
}

}  // namespace quorvel::tools
