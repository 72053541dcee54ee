// The daemon as it is installed: start-up, the state directory, the operation, and the end.
#include <sys/ptrace.h>
#include <sys/wait.h>

#include "platform/ipc.h"
#include "protocol/quorvel_protocol.h"
#include "quorvel/client.h"
#include "support/figures.h"
#include "support/program.h"
#include "support/scratch_root.h"

namespace quorvel::test {

const std::string kImages = std::string(kStateDirectory) + "/regulatory_images/regulatory_images.plist";
const std::string kBanner = "main: ____________________ Quorvel startup _____________________";
const std::string kNoTelephony = "registerForTelvaneCallNotifications: Could not get the Telvane phone center";

class Daemon : public testing::Test {
 protected:
  Daemon() {
    ::umask(022);
    root.set_mode("/private/var/mobile/Library", 0755);
  }

  static std::string info(const std::string& path, const std::string& mode) {
    return "log_file_info: stat " + path + " uid=" + std::to_string(::getuid()) + " gid=" + std::to_string(::getgid()) +
           " p=" + mode;
  }

  // The lines of a load of the file at `path`, which cannot be opened, and whose directory is as `directory` says.
  static std::vector<std::string> unopened(const std::string& path, const std::string& error,
                                           const std::string& directory) {
    return {"_safe_open: open(" + path + ") failed: " + error, "_load_dict: Could not open " + path + ": " + error,
            "log_file_info: Can't stat " + path + ": " + error, directory};
  }

  // What one start logs after its banner.
  std::vector<std::string> start_and_stop() {
    Program daemon(daemon_program());
    EXPECT_TRUE(daemon.wait_until_ready());
    EXPECT_EQ(daemon.stop().status, 0);
    std::vector<std::string> lines = root.log_lines();
    EXPECT_EQ(lines.empty() ? "" : lines.front(), kBanner);
    if (!lines.empty()) lines.erase(lines.begin());
    return lines;
  }

  // One start's first lines after the banner.
  void expect_start(const std::vector<std::string>& expected) {
    std::vector<std::string> lines = start_and_stop();
    lines.resize(std::min(lines.size(), expected.size()));
    EXPECT_EQ(lines, expected);
  }

  ScratchRoot root;
};

TEST_F(Daemon, StartsInOrderAndSecuresItsStateDirectory) {
  std::vector<std::string> first_start =
      unopened(kDataFile, "No such file or directory", info(kStateDirectory, "40700"));
  first_start.push_back(std::string("data_ark_load: Could not load ") + kDataFile);
  first_start.push_back(kNoTelephony);
  EXPECT_EQ(start_and_stop(), first_start);
  EXPECT_EQ(root.mode_of(kStateDirectory), 0700u);

  root.set_mode(kStateDirectory, 0755);
  root.write_plist(kDataFile, dictionary({{"-Kept", "value"}, {"-PhoneNumber", "5"}}));
  EXPECT_EQ(start_and_stop(), std::vector<std::string>{kNoTelephony});
  EXPECT_EQ(root.mode_of(kStateDirectory), 0700u);
  EXPECT_EQ(root.read_plist(kDataFile), dictionary({{"-Kept", "value"}}));
}

TEST_F(Daemon, GoesOnWithSomethingElseInTheStateDirectorysPlace) {
  const std::string state = kStateDirectory;
  root.write_file(state, "not a directory");
  expect_start({"_safe_open: " + state + " type is 32768, not 16384", "halvardstart_local: couldn't open " + state});
  EXPECT_EQ(root.read_file(state), "not a directory");

  root.remove(state);
  root.make_directory("/elsewhere", 0755);
  root.make_link("/elsewhere", state);
  expect_start({"_safe_open: open(" + state + ") failed: Too many levels of symbolic links",
                "halvardstart_local: couldn't open " + state});
  EXPECT_EQ(root.mode_of("/elsewhere"), 0755u);
}

TEST_F(Daemon, GoesOnWithoutAStateDirectory) {
  const std::string state = kStateDirectory;
  const std::string missing = ": No such file or directory";
  // The log's path leads elsewhere, so that the directories above the state's can be missing.
  root.remove("/var");
  root.make_directory("/var/mobile/Library/Logs");
  root.remove("/private/var/mobile/Library");
  expect_start({"halvardstart_local: Could not mkdir " + state + " " + missing,
                "log_file_info: Can't stat " + state + missing,
                "log_file_info: Can't stat /private/var/mobile/Library" + missing,
                "_safe_open: open(" + state + ") failed" + missing, "halvardstart_local: couldn't open " + state});
}

TEST_F(Daemon, AnswersWithTheRegulatoryImages) {
  const PropertyValue images = dictionary({{"Rest of World", data("\x89PNG")}, {"Count", 2}});
  root.write_plist(kImages, images);
  Program daemon(daemon_program());
  ASSERT_TRUE(daemon.wait_until_ready());
  static_cast<void>(root.log_lines());
  const client::Client client;
  const auto expect_answer = [&](const PropertyValue& value, const std::vector<std::string>& log) {
    const client::Reply reply = client.copy_regulatory_images();
    EXPECT_FALSE(reply.error) << reply.error->description;
    EXPECT_EQ(reply.value, value);
    EXPECT_EQ(root.log_lines(), log);
  };
  expect_answer(images, {});
  // Read anew for each call.
  root.write_plist(kImages, dictionary({}));
  expect_answer(dictionary({}), {});
  root.write_plist(kImages, array({"images"}));
  expect_answer({}, {std::string(protocol::kCopyRegulatoryImages) + ": " + kImages + " does not hold a dictionary"});
  root.write_file(kImages, "garbage");
  expect_answer({}, {"_load_dict: Could not create dictionary from stream"});
  root.remove(kImages);
  root.set_mode(std::string(kStateDirectory) + "/regulatory_images", 0755);
  expect_answer({}, unopened(kImages, "No such file or directory",
                             info(std::string(kStateDirectory) + "/regulatory_images", "40755")));

  const client::Reply refused = client.call(protocol::kCopyRegulatoryImages, text("argument"));
  ASSERT_TRUE(refused.error);
  EXPECT_EQ(refused.error->code, client::ErrorCode::service_failure);
  EXPECT_EQ(refused.error->service_code, platform::kRefusedArgument);
  EXPECT_EQ(daemon.stop().status, 0);
}

TEST_F(Daemon, SigintEndsItAndASecondOneIsRefused) {
  Program daemon(daemon_program());
  ASSERT_TRUE(daemon.wait_until_ready());
  static_cast<void>(root.log_lines());
  EXPECT_EQ(run_to_end(daemon_program(), {}).status, 69);
  EXPECT_TRUE(daemon.running());
  daemon.send_signal(SIGINT);
  const Outcome outcome = daemon.wait();
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.err, "");
  EXPECT_TRUE(!root.exists("/run/quorvel/com.Orvane.quorveld.sock"));
}

// Threads that a debugger stops stand for those that wait for a disk. All of them together hold the end up only once.
TEST_F(Daemon, EndsWithoutThreadsThatDoNotComeBack) {
  if (kInstrumented) GTEST_SKIP() << "a sanitizer waits for every thread";
  root.ignore_log();
  Program daemon(daemon_program());
  ASSERT_TRUE(daemon.wait_until_ready());
  std::vector<pid_t> stuck;
  for (const auto& task : std::filesystem::directory_iterator("/proc/" + std::to_string(daemon.pid()) + "/task")) {
    const pid_t thread = std::stoi(task.path().filename());
    if (thread == daemon.pid()) continue;
    if (::ptrace(PTRACE_SEIZE, thread, nullptr, nullptr) != 0) GTEST_SKIP() << "threads cannot be stopped here";
    ASSERT_EQ(::ptrace(PTRACE_INTERRUPT, thread, nullptr, nullptr), 0);
    ASSERT_EQ(::waitpid(thread, nullptr, __WALL), thread);
    stuck.push_back(thread);
  }
  EXPECT_GE(stuck.size(), 3u);
  const auto start = std::chrono::steady_clock::now();
  daemon.send_signal(SIGTERM);
  for (const pid_t thread : stuck) ::waitpid(thread, nullptr, __WALL);
  const Outcome outcome = daemon.wait();
  EXPECT_LT(std::chrono::steady_clock::now() - start, 1s);
  EXPECT_EQ(outcome.status, 0);
  EXPECT_EQ(outcome.err,
            "quorveld: a thread of the IPC service does not end; it is left behind\n"
            "quorveld: the thread of the notification center does not end\n");
}

}  // namespace quorvel::test
