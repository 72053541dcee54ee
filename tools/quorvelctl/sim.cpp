#include <memory>

#include "sim_words.h"

namespace quorvel::tools {

CLI::App& add_sim_command(CLI::App& sim, CommandLine& line, const Words& words, const CommandWords& own, Run run) {
  CLI::App& command = add_command(sim, own);
  when_chosen(command, [&line, words, run] { line.run = [&line, words, run] { return run(*words, line.json); }; });
  return command;
}

void add_sim(CLI::App& app, CommandLine& line) {
  CLI::App& sim = add_group(app, {"sim", "Command the simulated telephony service, telvane-sim",
                                  "  quorvelctl sim insert --iccid 8944501234567890123 \\\n"
                                  "    --imsi 234150999999999\n"
                                  "  quorvelctl sim show\n"
                                  "  quorvelctl sim eject"});
  const auto words = std::make_shared<SimWords>();
  add_state_commands(sim, line, words);
  add_event_commands(sim, line, words);
}

}  // namespace quorvel::tools
