// Words of a call that the command-line parser must take as they are.
//
// The parser would take "-5" for an option and "[1,2]" for a list of words, but both are values that people type. Such
// words are marked before parsing, and the mark is taken off as the parser hands them out.
#pragma once

#include <string>
#include <vector>

namespace quorvel::tools {

/// Stands in front of a marked word.
inline constexpr char kMark = '\x01';

/// The words of the call, in the parser's order (the last one first), marked where needed.
[[nodiscard]] std::vector<std::string> marked_words(int count, char** words);

}  // namespace quorvel::tools
