#include "log/log_writer.h"

#include <gtest/gtest.h>

#include <map>
#include <thread>

#include "log/daemon_log.h"
#include "support/descriptors.h"
#include "support/scratch_root.h"

namespace quorvel::test {
namespace {

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
}

TEST(LogWriter, AFullFileThatCannotBeMovedGoesOnGrowing) {
  ScratchRoot root;
  root.ignore_log();
  root.make_directory("/private/var/mobile/Library/Logs/quorveld.log.1");
  root.write_file("/private/var/mobile/Library/Logs/quorveld.log.1/in the way", "");
  root.write_file("/private/var/mobile/Library/Logs/quorveld.log", std::string(1'048'576, 'x'));
  log_write_line("line\n");
  const std::size_t open = descriptors_open();
  for (int i = 0; i < 100; ++i) log_write_line("line\n");
  EXPECT_EQ(root.read_file(kLogFile).size(), 1'048'576u + 505);
  EXPECT_EQ(descriptors_open(), open);
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
    const auto seen = last.find(thread);
    if (seen != last.end()) {
      ASSERT_EQ(number, seen->second + 1) << thread;
    }
    last[thread] = number;
  }
  for (int t = 0; t < kThreads; ++t) EXPECT_TRUE(!last.contains(t) || last[t] == kLines - 1) << t;
  EXPECT_GT(last.size(), 0u);
}

}  // namespace
}  // namespace quorvel::test
