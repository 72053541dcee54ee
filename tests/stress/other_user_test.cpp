// Another user of the device, without privileges, who takes everything that can be taken.
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/wait.h>

#include "linux/base/local_socket.h"
#include "stress/stressed_daemon.h"
#include "wire/service_path.h"

namespace quorvel::test {
namespace {

constexpr uid_t kOtherUser = 12345;

struct Attack {
  const char* name;
  bool observes;
  std::string first;   // what each connection sends at once
  std::string always;  // what each sends every fifth of a second
  bool reads = false;  // and whether it takes what it is answered with
};

void PrintTo(const Attack& attack, std::ostream* out) { *out << attack.name; }

// A process of the other user that holds as many connections as it can get, and opens those anew that are closed.
class OtherUser {
 public:
  OtherUser(const Attack& attack, std::size_t connections)
      : held_(static_cast<std::atomic<std::size_t>*>(
            ::mmap(nullptr, sizeof *held_, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0))) {
    pid_ = ::fork();
    if (pid_ == 0) attack_until_killed(attack, connections);
  }
  ~OtherUser() {
    ::kill(pid_, SIGKILL);
    ::waitpid(pid_, nullptr, 0);
    ::munmap(held_, sizeof *held_);
  }
  OtherUser(const OtherUser&) = delete;
  OtherUser& operator=(const OtherUser&) = delete;

  [[nodiscard]] std::size_t held() const { return *held_; }

 private:
  [[noreturn]] void attack_until_killed(const Attack& attack, std::size_t connections) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    const rlimit many = {connections + 64, connections + 64};
    ::setrlimit(RLIMIT_NOFILE, &many);
    if (::setgid(kOtherUser) != 0 || ::setuid(kOtherUser) != 0) ::_exit(1);
    const std::string_view service = attack.observes ? "notifications.sock" : "com.Orvane.quorveld.sock";
    std::vector<Descriptor> sockets(connections);
    for (;;) {
      std::size_t held = 0;
      for (Descriptor& socket : sockets) {
        char bytes[4096];
        const bool open = socket && ::recv(socket.get(), bytes, attack.reads ? sizeof bytes : 1,
                                           attack.reads ? MSG_DONTWAIT : MSG_PEEK | MSG_DONTWAIT) != 0;
        if (!open) {
          socket = platform::host::connect_local(service);
          if (socket) send(socket, attack.first);
        } else {
          send(socket, attack.always);
        }
        held += socket ? 1 : 0;
      }
      *held_ = held;
      ::usleep(200'000);
    }
  }
  static void send(const Descriptor& socket, const std::string& bytes) {
    static_cast<void>(::send(socket.get(), bytes.data(), bytes.size(), MSG_DONTWAIT | MSG_NOSIGNAL));
  }

  std::atomic<std::size_t>* held_;
  pid_t pid_ = -1;
};

std::string calls(int count) {
  std::string bytes;
  for (int i = 0; i < count; ++i) bytes += image_call(static_cast<std::uint64_t>(i));
  return bytes;
}

const Attack kAttacks[] = {{"Idle", false, {}, {}},
                           {"HalfCalls", false, calls(1).substr(0, 40), {}},
                           {"ActiveCalls", false, calls(1), calls(1)},
                           {"NeverReading", false, calls(400), calls(1)},
                           {"Observers", true, {}, {}}};

}  // namespace

class OtherUserTest : public StressedDaemon, public testing::WithParamInterface<Attack> {
 protected:
  void SetUp() override {
    if (::geteuid() != 0) GTEST_SKIP() << "becoming another user takes root";
    ASSERT_EQ(::chmod(root.outside().c_str(), 0755), 0);
  }
};

TEST_P(OtherUserTest, TakesNobodysPlace) {
  const std::size_t limit = is_long_run() ? 4096 : 256;
  provision_images(3000);
  start(static_cast<int>(limit));
  static_cast<void>(well_behaved_call());
  const long idle_memory = resident_kib(pid());

  const OtherUser other(GetParam(), limit * 2);
  ASSERT_TRUE(eventually([&] { return other.held() >= limit / 4; }, 20s)) << "the attack did not hit: " << other.held();
  std::vector<double> waits;
  double greeted = 0;
  for (long i = 0; i < quick_or_long(20, 200); ++i) {
    waits.push_back(well_behaved_call());
    const auto start = std::chrono::steady_clock::now();
    SocketPeer observer = SocketPeer::connected_to("notifications.sock");
    EXPECT_TRUE(observer.receive(2s)) << "an observer was not greeted";
    greeted =
        std::max(greeted, std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count());
    std::this_thread::sleep_for(50ms);
  }
  const std::string crowd = std::string("another user, ") + GetParam().name + ": ";
  const Latencies latencies = latencies_of(std::move(waits));
  tell_figure(crowd + "good calls", "each within 1 s", written(latencies), latencies.worst <= 1000);
  tell_figure(crowd + "new observers", "each within 1 s", written(greeted, "ms"), greeted <= 1000);
  const double grown = static_cast<double>(resident_kib(pid()) - idle_memory) / 1024;
  tell_figure(crowd + "memory above idle", "32 MiB", written(grown, "MiB"), grown <= 32);
  expect_quick_end("beside another user");
}

// Each call without images is worth four lines. As many calls as would fill both generations of the log several times.
TEST_F(OtherUserTest, PushesNoLineOutOfTheLog) {
  start();
  const OtherUser other({"FailingCalls", false, {}, calls(100), true}, 16);
  constexpr unsigned long kLinesOfTwoGenerations = 2 * 1'048'576 / 150;
  unsigned long left_out = 0;
  std::vector<double> waits;
  std::string log;
  static_cast<void>(eventually([&] {
    waits.push_back(well_behaved_call());
    log = root.read_file(kLogFile);
    left_out = 0;
    constexpr std::string_view kLeftOut = "daemon_log: left out ";
    for (auto at = log.find(kLeftOut); at != std::string::npos; at = log.find(kLeftOut, at + 1))
      left_out += std::stoul(log.substr(at + kLeftOut.size()));
    return left_out > 2 * kLinesOfTwoGenerations;
  }));
  const bool kept = log.find("main: ") < 100 && !root.exists(std::string(kLogFile) + ".1");
  tell_figure("another user, calls that log", "the first line is still in the log",
              std::to_string(left_out) + " lines left out, " + std::to_string(log.size()) + " bytes of log",
              kept && left_out > kLinesOfTwoGenerations);
  const Latencies latencies = latencies_of(std::move(waits));
  tell_figure("another user, calls that log: good calls", "each within 1 s", written(latencies),
              latencies.worst <= 1000 || kInstrumented);
}

INSTANTIATE_TEST_SUITE_P(other_user, OtherUserTest, testing::ValuesIn(kAttacks), testing::PrintToStringParamName());

}  // namespace quorvel::test
