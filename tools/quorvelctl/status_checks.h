// The looks that `status` takes at a daemon from outside.
#pragma once

#include <string>
#include <vector>

#include "daemon_process.h"
#include "property/value.h"

namespace quorvel::tools {

/// `absent`: the daemon does not run. `unknown`: the caller may not see it.
enum class Verdict { well, ill, unknown, absent };

struct Finding {
  std::string name;
  Verdict verdict = Verdict::well;
  std::vector<std::string> lines;  // for people, the first one says how it is
  std::string reason;              // why it is not well
  PropertyValue facts;             // for programs, a dictionary
};

/// The look found something wrong; people are told `reason` behind `heading`.
void find_ill(Finding& finding, std::string reason, const std::string& heading = {});

/// Dates count from 2001, the kernel from 1970.
inline constexpr double kSecondsTo2001 = 978'307'200;

/// "DATE, N hours ago".
[[nodiscard]] std::string since_text(double date);

[[nodiscard]] Finding check_daemon(const Server& daemon);
/// Calls the daemon, which has a service manager start one that does not run.
[[nodiscard]] Finding check_calls();
[[nodiscard]] Finding check_telephony(const Server& daemon);
[[nodiscard]] Finding check_ark();
[[nodiscard]] Finding check_log();

}  // namespace quorvel::tools
