// What the harnesses measure, and how it is told: one line for each figure, which scripts/stress puts into a table.
#pragma once

#include <string>
#include <string_view>

namespace quorvel::test {

/// A sanitizer slows everything down and keeps memory that was freed: figures are told then, but not judged.
#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__)
inline constexpr bool kInstrumented = true;
#else
inline constexpr bool kInstrumented = false;
#endif

/// True in the long runs of scripts/stress, which sets QUORVEL_STRESS=long.
[[nodiscard]] bool is_long_run();
/// The first for a run among the other tests (a tenth of it under a sanitizer), the second for a long run.
[[nodiscard]] long quick_or_long(long quick, long long_run);

/// Prints a figure beside its goal. One that is missed fails the test.
void tell_figure(std::string_view what, std::string_view goal, const std::string& measured, bool met);
/// The same where the machine decides as well as the program: a miss is told, and fails nothing.
void tell_machine_figure(std::string_view what, std::string_view goal, const std::string& measured, bool met);

}  // namespace quorvel::test
