// Texts for a reader at a terminal: what stands out where, and what never gets there.
#include "common/human_text.h"

#include <fcntl.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdlib>

#include "support/values.h"

namespace quorvel::tools {
namespace {

// Whether a program whose standard output is a terminal of this kind uses colours.
bool uses_colours(const char* terminal, const char* no_color) {
  const pid_t child = ::fork();
  if (child == 0) {
    const int control = ::posix_openpt(O_RDWR | O_NOCTTY);
    if (control < 0 || ::grantpt(control) != 0 || ::unlockpt(control) != 0) ::_exit(2);
    ::dup2(::open(::ptsname(control), O_RDWR | O_NOCTTY), STDOUT_FILENO);
    terminal == nullptr ? ::unsetenv("TERM") : ::setenv("TERM", terminal, 1);
    no_color == nullptr ? ::unsetenv("NO_COLOR") : ::setenv("NO_COLOR", no_color, 1);
    ::_exit(palette().key.empty() ? 0 : 1);
  }
  int status = 0;
  ::waitpid(child, &status, 0);
  EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) < 2);
  return WEXITSTATUS(status) == 1;
}

}  // namespace

TEST(HumanText, HasColoursOnATerminalThatWantsThem) {
  EXPECT_TRUE(uses_colours("xterm", nullptr));
  EXPECT_TRUE(uses_colours("xterm", ""));
  EXPECT_FALSE(uses_colours("xterm", "1"));
  EXPECT_FALSE(uses_colours("dumb", nullptr));
  EXPECT_FALSE(uses_colours(nullptr, nullptr));
}

TEST(HumanText, IsSafeForTerminalsAndShells) {
  EXPECT_EQ(displayable("a\tb\n\033[2J \u202e\u200bé"), "a\\tb\\n\\x1b[2J \\xe2\\x80\\xae\\xe2\\x80\\x8bé");
  EXPECT_EQ(displayable(std::string(300, '\xff')).size(), 1200u);
  const std::pair<const char*, const char*> words[] = {
      {"/tmp/device", "/tmp/device"}, {"", "''"},    {"a b", "'a b'"}, {"$(x)", "'$(x)'"},
      {"it's", "'it'\\''s'"},         {"~x", "'~x'"}};
  for (const auto& [word, quoted] : words) EXPECT_EQ(shell_word(word), quoted);
  const PropertyValue value = test::dictionary(
      {{"b", test::array({1, test::dictionary({{"c", "x\ny"}})})}, {"a", test::dictionary({})}, {"", "\033"}});
  EXPECT_EQ(human_text(value), "\"\": \\x1b\na:  {}\nb:\n  - 1\n  -\n    c: x\\ny\n");
  EXPECT_EQ(human_text(test::dictionary({})), "{}\n");
}

}  // namespace quorvel::tools
