#include <cstdint>

#include "commands.h"
#include "common/human_text.h"
#include "output.h"
#include "status_checks.h"

namespace quorvel::tools {
namespace {

constexpr std::size_t kNameColumns = 11;

void print_findings(const std::vector<Finding>& findings) {
  const Palette& colours = palette();
  const std::size_t width = terminal_width().value_or(SIZE_MAX);
  std::string text;
  for (const Finding& finding : findings) {
    const std::string_view shade = finding.verdict == Verdict::well ? std::string_view() : colours.warning;
    text.append(colours.key).append(finding.name).append(colours.reset).append(kNameColumns - finding.name.size(), ' ');
    for (std::size_t i = 0; i < finding.lines.size(); ++i) {
      text.append(i == 0 ? 0 : kNameColumns, ' ').append(i == 0 ? shade : colours.quiet);
      text.append(wrapped(displayable(finding.lines[i]), kNameColumns, width)).append(colours.reset).append("\n");
    }
  }
  write_output(text);
}

int print_status(bool json) {
  const Server daemon = server_of("notifications");
  std::vector<Finding> findings{check_daemon(daemon)};
  // A call would have a service manager start a daemon that does not run.
  if (daemon.state == Server::State::serving) findings.push_back(check_calls());
  findings.push_back(check_telephony(daemon));
  findings.push_back(check_ark());
  findings.push_back(check_log());
  bool well = true;
  PropertyValue all = PropertyValue::dictionary();
  for (Finding& finding : findings) {
    put(finding.facts, "well", PropertyValue::boolean(finding.verdict == Verdict::well));
    if (!finding.reason.empty()) put(finding.facts, "reason", PropertyValue::string(displayable(finding.reason)));
    well = well && finding.verdict == Verdict::well;
    put(all, finding.name, finding.facts);
  }
  put(all, "well", PropertyValue::boolean(well));
  if (json) {
    print_value(all, true);
  } else {
    print_findings(findings);
  }
  if (findings.front().verdict == Verdict::absent) return kUnreachable;
  return well ? kDone : kNoValue;
}

}  // namespace

void add_status(CLI::App& app, CommandLine& line) {
  CLI::App& command =
      add_command(app, {"status", "Tell whether the daemon is there and all is well",
                        "  quorvelctl status\n"
                        "  quorvelctl status --json | jq .well",
                        "Looks from outside: at the sockets, at the daemon's process, at the saved data "
                        "ark and at the log. Some of it only root and the daemon's user can see.\n\n"
                        "Exit status: 0 all is well; 1 something is not, or cannot be seen; 3 the daemon "
                        "does not run."});
  when_chosen(command, [&line] { line.run = [&line] { return print_status(line.json); }; });
}

}  // namespace quorvel::tools
