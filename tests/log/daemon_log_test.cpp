#include "log/daemon_log.h"

#include <gtest/gtest.h>

#include <ctime>
#include <regex>

#include "log/message.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

TEST(DaemonLog, WritesTheLineFormat) {
  ScratchRoot root;
  root.ignore_log();
  setenv("TZ", "UTC", 1);
  daemon_log(0, "data_ark_set", "dirtied by changing %@", text("-Key"));
  daemon_log(1, nullptr, "100%%");
  const std::string log = root.read_file(kLogFile);
  const std::string head =
      "[A-Z][a-z]{2} [A-Z][a-z]{2} [ 123][0-9] [0-9]{2}:[0-9]{2}:[0-9]{2} [0-9]{4} pid=" + std::to_string(getpid()) +
      " \\(0x[0-9a-f]+\\) ";
  EXPECT_TRUE(std::regex_match(log, std::regex(head + "data_ark_set: dirtied by changing -Key\n" + head + ": 100%\n")))
      << log;
}

TEST(DaemonLog, InsertsEveryKindOfArgument) {
  ScratchRoot root;
  const int number = -7;
  daemon_log(0, "f", "%d|%5d|%-5d|%05d|%i", number, number, number, number, 0);
  daemon_log(0, "f", "%ld.%ld|%llu|%zu", -2147483648L, 9L, ~0ULL, std::size_t{3});
  daemon_log(0, "f", "%o|%x|%X|%u", 040700u, 0xbeefu, 0xbeefu, 5u);
  daemon_log(0, "f", "%s|%.2s|%4s|%c|%s", "text", "text", "t", 'x', std::string_view("view"));
  daemon_log(0, "f", "%s|%s", static_cast<const char*>(nullptr), "a\nb\xff");
  daemon_log(0, "f", "%@|%@|%@", PropertyValue{}, array({"x\n%s", 2}), data("\x01\x02\x03\x04"));
  root.expect_log({"f: -7|   -7|-7   |-0007|0", "f: -2147483648.9|18446744073709551615|3", "f: 40700|beef|BEEF|5",
                   "f: text|te|   t|x|view", "f: (null)|a\\nb\\xff", R"(f: (null)|["x\n%s", 2]|<01020304 4 bytes>)"});
}

TEST(DaemonLog, AMessageThatCannotBeFormattedBecomesTheFallback) {
  ScratchRoot root;
  const LogArgument number(1);
  daemon_log_arguments(0, "f", nullptr, {});
  daemon_log_arguments(0, "f", "%d %d", std::span(&number, 1));
  daemon_log_arguments(0, "f", "%ld", std::span(&number, 1));
  daemon_log_arguments(0, "f", "none", std::span(&number, 1));
  daemon_log_arguments(0, "f", "%q", std::span(&number, 1));
  daemon_log_arguments(0, "f", "%", std::span(&number, 1));
  const std::string fallback = "f: error: the message string could not be created";
  root.expect_log({fallback, fallback, fallback, fallback, fallback, fallback});
}

TEST(DaemonLog, ALineIsCutAt2047Bytes) {
  ScratchRoot root;
  root.ignore_log();
  daemon_log(0, "f", "%s", "");
  const std::size_t head = root.read_file(kLogFile).size() - 1;
  for (const std::size_t length : {2045u, 2046u, 2047u, 2048u, 2049u, 100'000u}) {
    const std::size_t before = root.read_file(kLogFile).size();
    daemon_log(0, "f", "%s", std::string(length - head, 'x').c_str());
    const std::string line = root.read_file(kLogFile).substr(before);
    EXPECT_EQ(line.size(), std::min<std::size_t>(length + 1, 2047)) << length;
    EXPECT_EQ(line.back(), length < 2047 ? '\n' : 'x') << length;
  }
  const std::size_t before = root.read_file(kLogFile).size();
  std::string faces;
  for (int i = 0; i < 600; ++i) faces += "😀";
  daemon_log(0, "f", "%@", text(faces));
  const std::string line = root.read_file(kLogFile).substr(before);
  EXPECT_GT(line.size(), 2043u);
  EXPECT_LE(line.size(), 2047u);
  EXPECT_TRUE(line.ends_with("😀"));
}

}  // namespace
}  // namespace quorvel::test
