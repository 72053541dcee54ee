// Each call of start-up (the load and the save in it), a request, a telephony run, a reconnection to the telephony
// service and a log rotation fails with each of its errors, once and from then on.
#include <future>
#include <set>

#include "faults/daemon_under_faults.h"
#include "platform/telephony.h"
#include "quorvel/observer.h"
#include "support/socket_peer.h"
#include "wire/telephony_state.h"

namespace quorvel::test {
namespace {

using faults::Action;
using faults::Call;

// How long a fault that stays may keep the daemon from its work before it ceases.
constexpr auto kFaultLasts = 150ms;
constexpr std::size_t kRotationThreshold = 1'048'576;

client::Options within(std::chrono::milliseconds timeout) {
  client::Options options;
  options.timeout = timeout;
  return options;
}

struct Case {
  Call call;
  std::uint32_t ordinal;  // among the calls of its kind, because the threads' order changes
  int error;
  Action action;
};

const faults::CallErrors& errors_of(Call call) { return faults::kCallErrors[static_cast<std::size_t>(call)]; }

std::vector<Case> cases_of(const std::vector<Call>& trace) {
  std::vector<Case> cases;
  std::map<Call, std::uint32_t> ordinals;
  for (const Call call : trace) {
    const std::uint32_t ordinal = ++ordinals[call];
    for (const int error : errors_of(call).errors) {
      if (error == 0) break;
      cases.push_back({call, ordinal, error, Action::fail_once});
      cases.push_back({call, ordinal, error, Action::fail_from_then_on});
    }
  }
  return cases;
}

// A telephony service whose every step the test takes itself.
class FakeTelephony {
 public:
  // Takes in whoever has connected, in place of the connection before. True when somebody had.
  bool accept() {
    bool accepted = false;
    while (SocketPeer next = accept_from(listener_, 0ms)) {
      connection_ = std::move(next);
      accepted = true;
    }
    return accepted;
  }

  void drop() { connection_ = SocketPeer(Descriptor()); }

  // Announces a new SIM with this identity, to nobody when nobody is connected.
  void insert_sim(const std::string& identity) {
    const PropertyValue state = dictionary({{wire::kSimStatusField.text(), dictionary({{"Value", "Ready"}})},
                                            {wire::kIccidField.text(), dictionary({{"Value", identity}})},
                                            {wire::kGid1Field.text(), dictionary({{"Value", identity}})}});
    // The daemon may have left the connection by now.
    connection_.send(frame_bytes(wire::FrameKind::event, 0, platform::kSimNewlyInserted.text(), state));
  }

 private:
  Descriptor listener_ = listen_on("telvane.sock");
  SocketPeer connection_{Descriptor()};
};

class FaultSweep : public testing::Test {
 protected:
  using Step = std::function<std::string()>;

  // What is tried: `prepare` brings the daemon up to it and arms the plan, `act` does it and ends when the fault may
  // cease, `check` looks at the daemon afterwards. The last two tell what is wrong, or nothing.
  struct Operation {
    const char* name;
    std::function<void()> prepare;
    Step act;
    Step check;
  };

  void sweep(const Operation& operation, std::size_t quick_cases) {
    run(operation, {Call::count, 0, 0, Action::count_only});
    const std::vector<Case> cases = cases_of(daemon.trace());
    // An odd step, so that faults of both durations have their turn.
    const std::size_t step = is_long_run() ? 1 : (cases.size() / quick_cases) | 1;
    int tried = 0;
    for (std::size_t i = 0; i < cases.size(); i += step, ++tried) run(operation, cases[i]);
    tell_figure(std::string("one failing call, ") + operation.name, "3,000 injections in all, 0 failures",
                std::to_string(injected) + " injected of " + std::to_string(cases.size()) + " cases, " +
                    std::to_string(failures) + " failures",
                failures == 0);
    // Some calls depend on which thread comes first, and on how often a timer came due in the undisturbed run.
    EXPECT_GE(injected, tried * 4 / 5);
    EXPECT_GE(cases.size(), quick_cases);
  }

  void run(const Operation& operation, const Case& tried) {
    faults::Plan& plan = daemon.prepare();
    plan.kind = tried.call;
    plan.target = tried.ordinal;
    plan.error = tried.error;
    plan.action = tried.action;
    operation.prepare();
    std::string fault = operation.act();
    daemon.disarm();
    if (plan.injected > 0) {
      ++injected;
      kinds.emplace(tried.call, tried.error);
    }
    for (const Step& step : {operation.check, Step([&] { return descriptor_fault(tried); }),
                             Step([&] { return daemon.ending_fault(); }), Step([&] { return daemon.store_fault(); })})
      if (fault.empty()) fault = step();
    if (fault.empty()) return;
    ++failures;
    const char* error = tried.error == faults::kShortTransfer ? "short" : ::strerrorname_np(tried.error);
    ADD_FAILURE() << operation.name << ", " << errors_of(tried.call).name << " number " << tried.ordinal << ", "
                  << error << (tried.action == Action::fail_once ? " once: " : " from then on: ") << fault << '\n'
                  << daemon.program().err();
  }

  // The undisturbed run settles how many descriptors there are.
  std::string descriptor_fault(const Case& tried) {
    if (tried.action != Action::count_only) return daemon.descriptor_fault(descriptors);
    std::this_thread::sleep_for(100ms);
    descriptors = descriptors_open(daemon.program().pid());
    return "";
  }

  // The daemon serves, observed and with telephony connected, its log open.
  void bring_up() {
    telephony.drop();
    daemon.start();
    ASSERT_TRUE(daemon.program().wait_until_ready());
    ASSERT_TRUE(eventually([this] { return telephony.accept(); }));
    ASSERT_EQ(daemon.service_fault(), "");
    daemon.provision_images();
    ASSERT_FALSE(observer.connect());
    std::this_thread::sleep_for(1ms);  // the client's connection is gone from the daemon as well
  }

  // A client that calls during the fault is answered or cut off, at the latest when the fault has ceased. Each call but
  // the first finds no images.
  std::string call(int count) {
    std::future<bool> client = std::async(std::launch::async, [&] {
      bool hung = false;
      for (int i = 0; i < count; ++i) {
        if (i > 0) daemon.provision_no_images();
        const client::Reply reply = daemon.call(3s);
        hung |= reply.error && reply.error->code == client::ErrorCode::timed_out;
      }
      return hung;
    });
    client.wait_for(kFaultLasts);
    daemon.disarm();
    return client.get() ? "a client hangs" : "";
  }

  std::string insert_sim() {
    telephony.insert_sim("1");
    client::Event event;
    static_cast<void>(observer.next(event, kFaultLasts));
    std::this_thread::sleep_for(3ms);  // what follows the notification
    return "";
  }

  // A SIM that is inserted once the fault has ceased is heard of by everybody.
  std::string telephony_fault() {
    client::Observer late(within(2s));
    if (const auto error = late.connect()) return "an observer is not taken in: " + error->description;
    client::Event event;
    const bool heard = eventually(
        [&] {
          telephony.accept();
          telephony.insert_sim(std::to_string(++sims));
          return !late.next(event, 100ms);
        },
        5s);
    if (!heard) return "telephony is not heard";
    const auto error = observer.next(event, 2s);
    if (error && error->code == client::ErrorCode::timed_out) return "an observer hangs";
    return daemon.service_fault();
  }

  // Either the daemon has ended as documented and can be started again, or it serves.
  std::string start_fault() {
    std::string fault;
    if (daemon.program().running()) fault = daemon.service_fault();
    if (daemon.program().running()) return fault;
    const Outcome outcome = daemon.program().wait();
    const bool documented = outcome.status == 69 || outcome.status == 71 || outcome.status == 78;
    const auto lines = std::count(outcome.err.begin(), outcome.err.end(), '\n');
    const bool told = outcome.err.starts_with("quorveld: ") && outcome.err.ends_with('\n') &&
                      (lines == 1 || daemon.plan().action == Action::fail_from_then_on);
    if (!documented || (!told && !daemon.plan().error_output_failed))
      return "start-up ends with status " + std::to_string(outcome.status);
    ++refused_starts;
    if (const std::string lost = daemon.store_fault(); !lost.empty()) return lost;
    daemon.start_without_library();
    return daemon.program().wait_until_ready() ? daemon.service_fault() : "the next start fails";
  }

  void sweep_start(const char* name) {
    const auto prepare = [this] {
      leave_behind();
      telephony.accept();
      daemon.arm();
      daemon.start();
    };
    const auto act = [this] {
      static_cast<void>(daemon.program().wait_until_ready(2 * kFaultLasts));
      return std::string();
    };
    sweep({name, prepare, act, [this] { return start_fault(); }}, 80);
    EXPECT_GE(refused_starts, 5);
  }

  [[nodiscard]] std::size_t log_size() const { return std::filesystem::file_size(daemon.root.path(kLogFile)); }

  // The next line fills the log.
  void fill_log() {
    daemon.root.write_file(std::string(kLogFile) + ".1", "the previous generation\n");
    const std::size_t before = kRotationThreshold - bring_up_logs;
    daemon.root.write_file(kLogFile, std::string(before - 1, 'x') + '\n');
    bring_up();
    bring_up_logs = log_size() - before + 400;
    std::size_t line = 0;
    for (std::size_t size = log_size(); size + line < kRotationThreshold; size += line) {
      daemon.provision_no_images();
      EXPECT_FALSE(daemon.call(5s).error);
      line = log_size() - size;
      ASSERT_NE(line, 0u);
    }
    daemon.provision_no_images();
    std::this_thread::sleep_for(1ms);
  }

  std::function<void()> leave_behind = [] {};
  Step serves = [this] { return daemon.service_fault(); };

  DaemonUnderFaults daemon;
  FakeTelephony telephony;
  client::Observer observer{within(5s)};
  std::set<std::pair<Call, int>> kinds;
  std::size_t descriptors = 0;
  int injected = 0;
  int failures = 0;
  int refused_starts = 0;
  int sims = 1;
  std::size_t bring_up_logs = 8000;  // more than the first run logs; then what the run before logged, and some lines
};

TEST_F(FaultSweep, StartUpWithItsLoadAndSave) { sweep_start("start-up, load, save"); }

TEST_F(FaultSweep, StartUpAfterACrash) {
  leave_behind = [this] {
    daemon.start_without_library();
    ASSERT_TRUE(daemon.program().wait_until_ready());
    daemon.kill();
  };
  sweep_start("start-up after a crash");
}

TEST_F(FaultSweep, StartUpWithAFileThatCannotBeLoaded) {
  daemon.use_data("not a property list");
  sweep_start("start-up, unreadable data");
}

TEST_F(FaultSweep, Request) {
  const auto prepare = [this] { bring_up(), daemon.arm(); };
  sweep({"request", prepare, [this] { return call(1); }, serves}, 60);
}

TEST_F(FaultSweep, TelephonyRun) {
  const auto prepare = [this] { bring_up(), daemon.arm(); };
  sweep({"telephony run", prepare, [this] { return insert_sim(); }, [this] { return telephony_fault(); }}, 60);
}

TEST_F(FaultSweep, TelephonyReconnection) {
  const auto prepare = [this] { bring_up(), daemon.arm(); };
  const auto act = [this] {
    telephony.drop();
    static_cast<void>(eventually([this] { return telephony.accept(); }, 300ms));
    return insert_sim();
  };
  sweep({"telephony reconnection", prepare, act, [this] { return telephony_fault(); }}, 30);
}

TEST_F(FaultSweep, LogRotation) {
  const auto prepare = [this] { fill_log(), daemon.arm(); };
  sweep({"log rotation", prepare, [this] { return call(2); }, serves}, 60);
  EXPECT_TRUE(std::any_of(kinds.begin(), kinds.end(), [](const auto& kind) { return kind.first == Call::renameat; }));
}

}  // namespace
}  // namespace quorvel::test
