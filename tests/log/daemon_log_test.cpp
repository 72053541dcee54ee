#include "log/daemon_log.h"

#include <pty.h>
#include <sys/resource.h>

#include <csignal>
#include <ctime>
#include <regex>

#include "log/client_lines.h"
#include "log/extended_logging.h"
#include "log/log_writer.h"
#include "log/message.h"
#include "platform/descriptor.h"
#include "platform/error_output.h"
#include "support/scratch_root.h"

// Takes the place of the C library's in this process.
static std::optional<time_t> clock_says;
extern "C" time_t time(time_t* out) noexcept {
  timespec now{};
  ::clock_gettime(CLOCK_REALTIME, &now);
  const time_t result = clock_says.value_or(now.tv_sec);
  if (out != nullptr) *out = result;
  return result;
}

namespace quorvel::test {

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

TEST(DaemonLog, TellsWhateverTheClockSaysInTheZoneOfTheMoment) {
  ScratchRoot root;
  root.ignore_log();
  const struct {
    time_t clock;
    const char* zone;
    const char* stamp;
  } cases[] = {{-1, "UTC0", "Wed Dec 31 23:59:59 1969"},
               {1'800'000'000, "UTC0", "Fri Jan 15 08:00:00 2027"},
               {1'800'000'001, "ABC-9", "Fri Jan 15 17:00:01 2027"},
               {300'000'000'000, "DEF3", "Tue Aug 15 02:20:00 11476"},
               {0, "DEF3", "Wed Dec 31 21:00:00 1969"}};
  for (const auto& one : cases) {
    clock_says = one.clock;
    ::setenv("TZ", one.zone, 1);
    daemon_log(0, "f", "m");
    const std::string log = root.read_file(kLogFile);
    EXPECT_TRUE(log.substr(log.rfind('\n', log.size() - 2) + 1).starts_with(one.stamp + std::string(" pid="))) << log;
  }
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
  for (const char* format : {"%d %d", "%ld", "none", "%q", "%"})
    daemon_log_arguments(0, "f", format, std::span(&number, 1));
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

TEST(ExtendedLogging, IsSettledByReleaseTypeThenPreference) {
  const struct {
    const char* name;
    PropertyValue release_type;
    PropertyValue preference;
    int expected;
  } cases[] = {
      {"neither", nullptr, nullptr, 0},
      {"internal", text("Internal"), nullptr, 1},
      {"internal in another case", text("internal"), nullptr, 0},
      {"no text", data("Internal"), nullptr, 0},
      {"preference", text("Release"), PropertyValue::integer(1), 1},
      {"a preference of 0 counts as well", nullptr, PropertyValue::integer(0), 1},
      {"a text is no integer", nullptr, text("1"), 0},
      {"a boolean is no integer", nullptr, PropertyValue::boolean(true), 0},
      {"a real is no integer", nullptr, PropertyValue::real(1), 0},
  };
  EXPECT_EQ(extended_logging, 1) << "until it is settled";
  ScratchRoot root;
  for (const auto& [name, release_type, preference, expected] : cases) {
    PropertyValue answers = dictionary({}), preferences = dictionary({{"Other", 1}});
    ASSERT_TRUE(!release_type || answers.set("ReleaseType", release_type));
    ASSERT_TRUE(!preference || preferences.set("ExtLogging", preference));
    root.write_plist("/etc/quorvel/device_information.plist", answers);
    root.write_plist("/private/var/mobile/Library/Preferences/com.Orvane.quorveld.plist", preferences);
    setup_extended_logging();
    EXPECT_EQ(extended_logging, expected) << name;
  }
}

TEST(ClientLines, SayTheSameOnceASecondAndThenHowOften) {
  ScratchRoot root;
  const auto fail = [](int times) {
    const ClientLines lines(12345, 678);
    for (int i = 0; i < times; ++i) daemon_log(0, "f", "failed at %d", 1);
  };
  fail(3);
  root.expect_log({"f: failed at 1"});
  // Not of a client, and of another function: every line is written.
  for (int i = 0; i < 2; ++i) daemon_log(0, "f", "failed at 1");
  daemon_log(0, "g", "failed at 1");
  root.expect_log(
      {"daemon_log: left out 2 lines that said the same again, the last of them for a call of user 12345, "
       "process 678",
       "f: failed at 1", "f: failed at 1", "g: failed at 1"});
  std::this_thread::sleep_for(1s);
  fail(2);
  root.expect_log({"f: failed at 1"});
  {
    const ClientLines lines(1, 2);
    daemon_log(0, "f", "failed at 2");
  }
  root.expect_log(
      {"daemon_log: left out 1 lines that said the same again, the last of them for a call of user 12345, "
       "process 678",
       "f: failed at 2"});
}

const std::string kPrevious = std::string(kLogFile) + ".1";

TEST(LogWriter, RotatesAfterTheLineThatFillsTheFile) {
  ScratchRoot root;
  root.ignore_log();
  root.write_file("/private/var/mobile/Library/Logs/quorveld.log", std::string(1'048'575 - 2, 'x') + "\n");
  root.write_file("/private/var/mobile/Library/Logs/quorveld.log.1", "older");
  log_write_line("a");
  EXPECT_EQ(root.read_file(kLogFile).size(), 1'048'575u);
  EXPECT_EQ(root.read_file(kPrevious), "older");
  log_write_line("b");
  EXPECT_FALSE(root.exists(kLogFile));
  EXPECT_EQ(root.read_file(kPrevious).size(), 1'048'576u);
  log_write_line("new\n");
  EXPECT_EQ(root.read_file(kLogFile), "new\n");
  EXPECT_EQ(root.mode_of("/private/var/mobile/Library/Logs/quorveld.log"), 0644u);
  EXPECT_EQ(log_rotate_if_needed("/nowhere", -1), 0);
  EXPECT_EQ(log_rotate_if_needed("/nowhere", 1'048'575), 0);
  EXPECT_EQ(log_rotate_if_needed("/nowhere", std::int64_t{1} << 40), 1);
}

TEST(LogWriter, WritesAgainOnceTheFileIsMended) {
  const std::string path = "/private/var/mobile/Library/Logs/quorveld.log";
  const struct {
    const char* name;
    void (*put)(ScratchRoot&, const std::string&);
  } obstacles[] = {
      {"directory", [](ScratchRoot& root, const std::string& at) { root.make_directory(at); }},
      {"FIFO", [](ScratchRoot& root, const std::string& at) { root.make_fifo(at); }},
      {"link", [](ScratchRoot& root, const std::string& at) { root.make_link("decoy", at); }},
      {"dangling link", [](ScratchRoot& root, const std::string& at) { root.make_link("nowhere", at); }},
  };
  ScratchRoot root;
  root.ignore_log();
  root.write_file("/private/var/mobile/Library/Logs/decoy", "untouched");
  // A rotation closes the file, so that each obstacle is met by an open.
  const auto rotate = [&] { log_write_line(std::string(1'048'576, '.').c_str()); };
  testing::internal::CaptureStderr();
  for (const auto& obstacle : obstacles) {
    rotate();
    obstacle.put(root, path);
    const std::size_t open = descriptors_open();
    for (int i = 0; i < 3; ++i) log_write_line("lost\n");
    EXPECT_EQ(descriptors_open(), open) << obstacle.name;
    root.remove(path);
    log_write_line("kept\n");
    EXPECT_EQ(root.read_file(path), "kept\n") << obstacle.name;
  }
  EXPECT_EQ(root.read_file("/private/var/mobile/Library/Logs/decoy"), "untouched");
  EXPECT_FALSE(root.exists("/private/var/mobile/Library/Logs/nowhere"));
  EXPECT_EQ(testing::internal::GetCapturedStderr(),
            "quorveld: _safe_open: open(/var/mobile/Library/Logs/quorveld.log) failed: Is a directory\n")
      << "told once a minute";
}

TEST(LogWriter, NeverWaitsForStandardError) {
  const Descriptor kept(::dup(STDERR_FILENO));
  for (const bool is_terminal : {false, true}) {
    int ends[2];
    ASSERT_EQ(is_terminal ? ::openpty(&ends[0], &ends[1], nullptr, nullptr, nullptr) : ::pipe(ends), 0);
    const Descriptor reader(ends[0]), output(ends[1]);
    ::dup2(output.get(), STDERR_FILENO);
    platform::write_error_output("told");
    EXPECT_EQ(::fcntl(output.get(), F_SETFL, O_NONBLOCK), 0);
    while (::write(output.get(), "x", 1) == 1) continue;
    EXPECT_EQ(::fcntl(output.get(), F_SETFL, 0), 0);
    platform::write_error_output("lost");
    ::dup2(kept.get(), STDERR_FILENO);
    char text[4] = {};
    EXPECT_EQ(::read(reader.get(), text, sizeof text), 4);
    EXPECT_EQ(std::string_view(text, 4), "told") << is_terminal;
  }
}

TEST(LogWriter, TellsOfALineThatTheDiskDidNotTake) {
  ScratchRoot root;
  root.ignore_log();
  std::signal(SIGXFSZ, SIG_IGN);
  const rlimit little = {1000, RLIM_INFINITY};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &little), 0);
  EXPECT_EXIT(
      (log_write_line(std::string(1001, 'x').c_str()), std::exit(log_took_last_line() ? 1 : 0)),
      testing::ExitedWithCode(0),
      "^quorveld: _safe_open: write\\(/var/mobile/Library/Logs/quorveld.log\\) failed: No space left on device\n$");
}

TEST(LogWriter, ThreadsThroughRotationsKeepEveryLineWholeAndInOrder) {
  constexpr int kThreads = 8, kLines = 5'000;
  ScratchRoot root;
  root.ignore_log();
  std::vector<std::thread> threads;
  for (int t = 0; t < kThreads; ++t) {
    threads.emplace_back([t] {
      for (int i = 0; i < kLines; ++i) daemon_log(0, "f", "thread %d line %d %s", t, i, std::string(180, '=').c_str());
    });
  }
  for (auto& thread : threads) thread.join();
  // Older generations are gone by now: what is left must be the unbroken end of each thread's lines.
  std::map<int, int> last;
  std::istringstream lines(root.read_file(kPrevious) + root.read_file(kLogFile));
  for (std::string line; std::getline(lines, line);) {
    int thread = -1, number = -1;
    ASSERT_EQ(std::sscanf(line.c_str() + line.find(" f: "), " f: thread %d line %d =", &thread, &number), 2) << line;
    ASSERT_TRUE(line.ends_with(std::string(180, '=')));
    ASSERT_TRUE(!last.contains(thread) || number == last[thread] + 1) << thread;
    last[thread] = number;
  }
  for (int t = 0; t < kThreads; ++t) EXPECT_TRUE(!last.contains(t) || last[t] == kLines - 1) << t;
  EXPECT_GT(last.size(), 0u);
}

}  // namespace quorvel::test
