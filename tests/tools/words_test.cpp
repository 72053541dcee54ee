// The words of the command line: the help, the man pages and the completions are the same everywhere.
#include <fstream>

#include "support/program.h"
#include "support/scratch_root.h"

namespace quorvel::test {
namespace {

std::string output_of(const std::string& program, const std::vector<std::string>& words) {
  const Outcome outcome = run_to_end(program, words);
  EXPECT_EQ(outcome.status, 0) << testing::PrintToString(words) << outcome.err;
  return outcome.out;
}

std::vector<std::string> lines_of(const std::string& text) {
  std::vector<std::string> lines;
  std::istringstream stream(text);
  for (std::string line; std::getline(stream, line);) lines.push_back(line);
  return lines;
}

// The help of a command and of every command below it.
void expect_narrow_help(std::vector<std::string> words) {
  std::vector<std::string> below = words;
  below.insert(below.begin(), "__complete");
  below.emplace_back();
  const std::string commands = output_of(control_program(), below);
  words.emplace_back("--help");
  const std::string help = output_of(control_program(), words);
  words.pop_back();
  EXPECT_TRUE(help.find("Usage: quorvelctl") != std::string::npos);
  for (const std::string& line : lines_of(help)) EXPECT_LE(line.size(), 80u) << line;
  if (help.find("\nCommands:\n") == std::string::npos) return;
  for (const std::string& line : lines_of(commands)) {
    words.push_back(line.substr(0, line.find('\t')));
    expect_narrow_help(words);
    words.pop_back();
  }
}

}  // namespace

TEST(Words, FillNoMoreThanATerminalsLine) {
  const ScratchRoot root;
  expect_narrow_help({});
  for (const std::string& program : {simulator_program(), bridge_program()}) {
    if (program.empty()) continue;
    for (const std::string& line : lines_of(output_of(program, {"--help"}))) EXPECT_LE(line.size(), 80u) << line;
    const Outcome outcome = run_to_end(program, {"--frob"});
    const std::string name = program.substr(program.rfind('/') + 1);
    EXPECT_EQ(outcome.status, 64);
    EXPECT_EQ(outcome.err, name + ": \"--frob\" is no option here. See: " + name + " --help\n");
  }
}

TEST(Words, StandInColumns) {
  const ScratchRoot root;
  EXPECT_EQ(output_of(control_program(), {"monitor", "--help"}),
            R"(Print each posted notification as it arrives.

Usage: quorvelctl monitor [--name PATTERN] [--count N]

Goes on until it is interrupted, also when the daemon ends and is started again.
A reader that is too slow is told how many notifications it missed.

Options:
  --name PATTERN  Only notifications of this name, in which * and ? stand for
                  others
  --count N       End after N notifications

Options of every command:
  --root DIR  Directory that stands for the device's / (default: QUORVEL_ROOT,
              else /)
  --json      Print JSON, for programs
  -h, --help  Print this help and end

Examples:
  quorvelctl monitor
  quorvelctl monitor --count 1 --name 'com.example.*'
  quorvelctl monitor --json | jq -r .name
)");
}

TEST(Words, AreThoseOfTheManPages) {
  const ScratchRoot root;
  const std::pair<std::string, std::string> pages[] = {{control_program(), "quorvelctl.1"},
                                                       {simulator_program(), "telvane-sim.8"},
                                                       {bridge_program(), "quorvel-modem-bridge.8"}};
  for (const auto& [program, name] : pages) {
    if (program.empty()) continue;
    std::ifstream file(QUORVEL_SOURCE_DIR "/packaging/man/" + name);
    const std::string page{std::istreambuf_iterator<char>(file), {}};
    const std::string begin = "__man\" prints.\n";
    const std::size_t start = std::min(page.find(begin), page.size() - begin.size()) + begin.size();
    const std::string lists = page.substr(start, page.find(".\\\" End of the lists.") - start);
    EXPECT_EQ(lists, output_of(program, {"__man"})) << "put what the program prints between the marks of " << name;
  }
}

TEST(Words, AreOfferedWhereTheyCanStand) {
  ScratchRoot root;
  root.write_plist(kDataFile, dictionary({{"a b-My key", 5}, {"-Own", 1}, {"a b-\033[2J", 1}}));
  root.write_plist("/private/var/mobile/Library/Preferences/com.example.plist", dictionary({{"Key", 1}}));
  const std::pair<std::vector<std::string>, std::string> cases[] = {
      {{"p"}, "preferences plist"},
      {{"sim", "show", ""}, ""},
      {{"--root=/x"}, ":directory"},
      {{"--root", ""}, ":directory"},
      {{"root", "create", ""}, ":directory"},
      {{"plist", "show", ""}, ":file"},
      {{"ark", "list", "--dom"}, "--domain --domains"},
      {{"ark", "get", "--domain", "a b", ""}, "My key"},
      {{"ark", "get", "--domain=a b", "My"}, "My key"},
      {{"ark", "get", "Ow"}, "Own"},
      {{"ark", "get", "--raw", "--domain=a"}, "a b"},
      {{"ark", "get", "--domain", "com.Orvane.mobile.battery", "BatteryIs"}, "BatteryIsCharging"},
      {{"preferences", "get", ""}, "com.Orvane.quorveld com.example"},
      {{"preferences", "set", "com.example", ""}, "Key"},
      {{"preferences", "set", "com.example", "Key", ""}, ""},
      {{"sim", "fail", "c"}, "connection"},
      {{"sim", "set", "c"}, ""},
      {{"sim", "notify", "--count", "2", "ph"}, "phone-number-changed"},
      {{"--", "ark", "get", "--ra"}, ""},
      {{"log", "--j"}, "--json"},
      {{"--v"}, "--version"},
  };
  for (const auto& [words, expected] : cases) {
    std::vector<std::string> call = words;
    call.insert(call.begin(), "__complete");
    std::string offered;
    for (const std::string& line : lines_of(output_of(control_program(), call))) {
      offered += (offered.empty() ? "" : " ") + line.substr(0, line.find('\t'));
    }
    EXPECT_EQ(offered, expected) << testing::PrintToString(words);
  }
}

TEST(Words, AreRefusedInAPersonsLanguage) {
  const ScratchRoot root;
  const std::pair<std::vector<std::string>, std::string> cases[] = {
      {{}, "a command is missing. See: quorvelctl --help"},
      {{"frob\033[2J"}, "\"frob\\x1b[2J\" is no command. See: quorvelctl --help"},
      {{"ark", "get"}, "KEY is missing. See: quorvelctl ark get --help"},
      {{"ark", "get", "--domain"}, "--domain needs a value behind it. See: quorvelctl ark get --help"},
      {{"root", "create", ""}, "DIR is empty; name a directory, such as /tmp/device"},
      {{"log", "surplus"}, "\"surplus\" has no meaning here. See: quorvelctl log --help"},
      {{"log", "--nope"}, "\"--nope\" is no option here. See: quorvelctl log --help"},
      {{"--root", "/", "--root", "/", "log"}, "--root is given more than once. See: quorvelctl log --help"},
  };
  for (const auto& [words, expected] : cases) {
    const Outcome outcome = run_to_end(control_program(), words);
    EXPECT_EQ(outcome.status, 2) << expected;
    EXPECT_EQ(outcome.err, "quorvelctl: " + expected + "\n");
  }
}

}  // namespace quorvel::test
