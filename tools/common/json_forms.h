// The JSON forms of what JSON itself has no kind for. Shared by the reader and the writer.
#pragma once

#include <string>
#include <string_view>

namespace quorvel::tools {

inline constexpr std::string_view kDataForm = "$data";
inline constexpr std::string_view kDateForm = "$date";
inline constexpr std::string_view kRealForm = "$real";

inline constexpr std::string_view kNotANumber = "nan";
inline constexpr std::string_view kNotANumberBits = "nan:";
inline constexpr std::string_view kInfinity = "inf";
inline constexpr std::string_view kMinusInfinity = "-inf";

/// True for the name of a form with any number of further $ in front.
[[nodiscard]] inline bool is_form_name(std::string_view key) noexcept {
  const std::size_t name = key.find_first_not_of('$');
  if (name == 0 || name == std::string_view::npos) return false;
  const std::string_view form = key.substr(name - 1);
  return form == kDataForm || form == kDateForm || form == kRealForm;
}

}  // namespace quorvel::tools
