// SIGKILL at every call of start-up and save, and at random instants of it.
#include <random>

#include "faults/daemon_under_faults.h"

namespace quorvel::test {
namespace {

using faults::Action;

class KillSweep : public testing::Test {
 protected:
  // The calls of an undisturbed start, and how long it takes.
  std::uint32_t calls_of_a_start() {
    daemon.prepare().flush_milliseconds = flush_milliseconds;
    daemon.arm();
    const auto begin = std::chrono::steady_clock::now();
    daemon.start();
    EXPECT_TRUE(daemon.program().wait_until_ready());
    start_takes = std::chrono::steady_clock::now() - begin;
    daemon.kill();
    return daemon.plan().calls;
  }

  // Looks at what a killed daemon left behind, and lets the next one start.
  void check_remains(const std::string& what) {
    ++kills;
    const faults::Plan& plan = daemon.plan();
    inside_save += plan.save_begun != 0 && plan.save_flushes < 2 ? 1 : 0;
    const std::string fault = daemon.store_fault();
    daemon.start_without_library();
    const bool serves = daemon.program().wait_until_ready() && !daemon.call(5s).error;
    if (fault.empty() && serves && daemon.holds_new_data()) return;
    ++failures;
    ADD_FAILURE() << what << ": " << fault << (serves ? "" : "; the next start does not serve") << '\n'
                  << daemon.program().err();
  }

  // False, rightly, for a wait that nothing ended, and for a call of the last, which are those of other threads and
  // need not come in each start.
  bool ends_at(std::uint32_t number, std::uint32_t calls) {
    const faults::Plan& plan = daemon.plan();
    const auto has_stayed = [&] {
      return plan.calls >= calls - 8 && (number + 8 > calls || plan.trace[number] == faults::Call::epoll_wait);
    };
    for (int tries = 0; tries < 100; ++tries) {
      if (daemon.has_ended(50ms)) return true;
      if (has_stayed()) return false;
    }
    ADD_FAILURE() << "call " << number << " was not reached, only " << plan.calls;
    return false;
  }

  void report(const char* name) const {
    tell_figure(std::string("killed at ") + name, "0 torn, 0 lost",
                std::to_string(kills) + " kills, " + std::to_string(inside_save) + " in the save, " +
                    std::to_string(failures) + " torn or lost",
                failures == 0);
  }

  DaemonUnderFaults daemon;
  std::chrono::steady_clock::duration start_takes{};
  std::uint32_t flush_milliseconds = 0;
  int kills = 0;
  int inside_save = 0;
  int failures = 0;
};

TEST_F(KillSweep, AtEveryCall) {
  const std::uint32_t calls = calls_of_a_start();
  // What makes a save safe from a power cut is the order of these.
  using faults::Call;
  std::vector<Call> order;
  const std::vector<Call> trace = daemon.trace();
  for (std::size_t i = daemon.plan().save_begun - 1; i < trace.size() && order.size() < 4; ++i) {
    if (trace[i] == Call::write || trace[i] == Call::fdatasync || trace[i] == Call::renameat) order.push_back(trace[i]);
  }
  EXPECT_EQ(order, (std::vector<Call>{Call::write, Call::fdatasync, Call::renameat, Call::fdatasync}));
  for (const Action action : {Action::kill_before, Action::kill_after}) {
    for (std::uint32_t number = 1; number <= calls; ++number) {
      faults::Plan& plan = daemon.prepare();
      plan.action = action;
      plan.target = number;
      daemon.arm();
      daemon.start();
      if (!ends_at(number, calls)) continue;
      check_remains("killed at call " + std::to_string(number));
    }
  }
  report("each call");
  EXPECT_GE(kills, 150);
  EXPECT_GE(inside_save, 20);
}

TEST_F(KillSweep, AtRandomInstants) {
  const int rounds = is_long_run() ? 10'000 : 200;
  flush_milliseconds = 2;
  calls_of_a_start();
  calls_of_a_start();
  std::mt19937_64 random(20'260'131);
  for (int round = 0; round < rounds; ++round) {
    const auto instant =
        std::chrono::nanoseconds(static_cast<std::int64_t>(random() % static_cast<std::uint64_t>(start_takes.count())));
    daemon.prepare().flush_milliseconds = flush_milliseconds;
    daemon.arm();
    const auto begin = std::chrono::steady_clock::now();
    daemon.start();
    std::this_thread::sleep_until(begin + instant);
    daemon.kill();
    check_remains("killed after " + std::to_string(instant.count()) + " ns");
  }
  report("random instants");
  EXPECT_EQ(kills, rounds);
  EXPECT_GE(inside_save, rounds / 50);
}

}  // namespace
}  // namespace quorvel::test
