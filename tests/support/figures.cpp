#include "support/figures.h"

#include "support/prelude.h"

namespace quorvel::test {

bool is_long_run() {
  const char* wanted = std::getenv("QUORVEL_STRESS");
  return wanted != nullptr && std::string_view(wanted) == "long";
}

long quick_or_long(long quick, long long_run) {
  if (is_long_run()) return long_run;
  return kInstrumented ? std::max(quick / 10, 1L) : quick;
}

void tell_machine_figure(std::string_view what, std::string_view goal, const std::string& measured, bool met) {
  std::printf("figure | %.*s | %.*s | %s | %s\n", static_cast<int>(what.size()), what.data(),
              static_cast<int>(goal.size()), goal.data(), measured.c_str(), met ? "ok" : "short");
  std::fflush(stdout);
}

void tell_figure(std::string_view what, std::string_view goal, const std::string& measured, bool met) {
  tell_machine_figure(what, goal, measured, met);
  EXPECT_TRUE(met || kInstrumented) << what << ": " << measured << ", the goal is " << goal;
}

}  // namespace quorvel::test
