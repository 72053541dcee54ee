// Another user of the device, without privileges, who takes everything that can be taken.
#include <linux/filter.h>
#include <linux/seccomp.h>
#include <netinet/in.h>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/wait.h>

#include <array>
#include <csignal>

#include "linux/base/local_socket.h"
#include "quorvel/observer.h"
#include "stress/stressed_daemon.h"

namespace quorvel::test {
namespace {

constexpr uid_t kOtherUser = 12345;

struct Attack {
  const char* name;
  bool observes;
  std::string first;      // what each connection sends at once
  std::string always;     // what each sends again and again
  bool reads = false;     // and whether it takes what it is answered with
  bool attaches = false;  // a lingering socket behind that, where the kernel does not refuse it
  int pause = 200;        // in milliseconds, between two times
};

// From now on neither this process nor what it starts can ask the kernel to refuse descriptors, as before Linux 6.16.
void become_an_older_kernel() {
  constexpr unsigned kPassRights = 83;
  sock_filter program[] = {
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, nr)),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, SYS_setsockopt, 0, 3),
      BPF_STMT(BPF_LD | BPF_W | BPF_ABS, offsetof(seccomp_data, args[2])),
      BPF_JUMP(BPF_JMP | BPF_JEQ | BPF_K, kPassRights, 0, 1),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ERRNO | ENOPROTOOPT),
      BPF_STMT(BPF_RET | BPF_K, SECCOMP_RET_ALLOW),
  };
  const sock_fprog filter = {std::size(program), program};
  ASSERT_EQ(::prctl(PR_SET_NO_NEW_PRIVS, 1, 0, 0, 0), 0);
  ASSERT_EQ(::prctl(PR_SET_SECCOMP, SECCOMP_MODE_FILTER, &filter), 0);
}

// A socket whose last closing waits for hours, over bytes that nobody takes. The other ends stay open.
Descriptor lingering_socket() {
  const Descriptor listener(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  sockaddr_in address = {};
  address.sin_family = AF_INET;
  address.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
  socklen_t size = sizeof address;
  auto* const plain = reinterpret_cast<sockaddr*>(&address);
  const int little = 4096;  // for the other end to take; the rest stays with the writer
  ::setsockopt(listener.get(), SOL_SOCKET, SO_RCVBUF, &little, sizeof little);
  if (::bind(listener.get(), plain, size) != 0 || ::listen(listener.get(), 1) != 0) ::_exit(2);
  ::getsockname(listener.get(), plain, &size);
  Descriptor writer(::socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC, 0));
  const int room = 64 << 10;
  ::setsockopt(writer.get(), SOL_SOCKET, SO_SNDBUF, &room, sizeof room);
  if (::connect(writer.get(), plain, size) != 0 || ::accept(listener.get(), nullptr, nullptr) < 0) ::_exit(3);
  const std::string bytes(4096, 'x');
  while (::send(writer.get(), bytes.data(), bytes.size(), MSG_DONTWAIT) > 0) continue;
  const linger hours = {1, 30'000};
  ::setsockopt(writer.get(), SOL_SOCKET, SO_LINGER, &hours, sizeof hours);
  return writer;
}

// The service may have dropped it before its sender closes it, who would then wait for hours: a signal ends that.
bool send_lingering(int socket, std::string_view bytes) {
  Descriptor attachment = lingering_socket();
  const bool sent = send_attached(socket, bytes, std::array{attachment.get()}) > 0;
  std::signal(SIGALRM, [](int) {});
  ::ualarm(1000, 1000);
  attachment = Descriptor();
  ::ualarm(0, 0);
  return sent;
}

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
    std::vector<Descriptor> sockets(attack.attaches ? 8 : connections);
    for (;;) {
      std::size_t held = 0;
      for (Descriptor& socket : sockets) {
        char bytes[4096];
        const bool open = socket && ::recv(socket.get(), bytes, attack.reads ? sizeof bytes : 1,
                                           attack.reads ? MSG_DONTWAIT : MSG_PEEK | MSG_DONTWAIT) != 0;
        if (!open) {
          socket = platform::host::connect_local(service);
          if (socket) send(socket, attack.first);
          if (socket && attack.attaches) *held_ += send_lingering(socket.get(), attack.always) ? 1 : 0;
        } else {
          send(socket, attack.always);
        }
        held += socket ? 1 : 0;
      }
      if (!attack.attaches) *held_ = held;
      for (int i = 0; attack.attaches && attack.reads && i < 20; ++i) read_all(sockets);
      ::usleep(static_cast<useconds_t>(attack.pause) * 1000);
      if (attack.attaches) sockets = std::vector<Descriptor>(sockets.size());
    }
  }
  static void send(const Descriptor& socket, const std::string& bytes) {
    static_cast<void>(::send(socket.get(), bytes.data(), bytes.size(), MSG_DONTWAIT | MSG_NOSIGNAL));
  }

  static void read_all(const std::vector<Descriptor>& sockets) {
    static char replies[65536];
    for (const Descriptor& socket : sockets) {
      while (socket && ::recv(socket.get(), replies, sizeof replies, MSG_DONTWAIT) > 0) continue;
    }
    ::usleep(5'000);
  }

  std::atomic<std::size_t>* held_;  // connections, or how often something was attached
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
                           {"Flooding", false, {}, calls(40), true, false, 1},
                           {"Observers", true, {}, {}},
                           {"AttachingToCalls", false, calls(400), calls(1), true, true},
                           {"AttachingBehindCalls", false, calls(400), calls(1), false, true},
                           {"AttachingObservers", true, {}, "x", false, true}};

}  // namespace

class OtherUserTest : public StressedDaemon, public testing::WithParamInterface<Attack> {
 protected:
  void SetUp() override {
    if (::geteuid() != 0) GTEST_SKIP() << "becoming another user takes root";
    ASSERT_EQ(::chmod(root.outside().c_str(), 0755), 0);
  }
};

TEST_P(OtherUserTest, TakesNobodysPlace) {
  if (GetParam().attaches) become_an_older_kernel();
  const std::size_t limit = is_long_run() ? 4096 : 256;
  provision_images(3000);
  start(static_cast<int>(limit));
  static_cast<void>(well_behaved_call());
  const long idle_memory = resident_kib(pid());
  const long calls_made = quick_or_long(20, 200);
  std::vector<double> idle_waits;
  for (long i = 0; i < calls_made; ++i) {
    idle_waits.push_back(well_behaved_call());
    std::this_thread::sleep_for(10ms);
  }
  const Latencies idle = latencies_of(std::move(idle_waits));

  const OtherUser other(GetParam(), limit * 2);
  ASSERT_TRUE(eventually([&] { return other.held() >= limit / 4; }, 20s)) << "the attack did not hit: " << other.held();
  std::vector<double> waits;
  double greeted = 0;
  for (long i = 0; i < calls_made; ++i) {
    waits.push_back(well_behaved_call());
    const auto start = std::chrono::steady_clock::now();
    const std::optional<client::Error> trouble = client::Observer().connect();
    EXPECT_FALSE(trouble) << "an observer was not greeted: " << trouble->description;
    greeted =
        std::max(greeted, std::chrono::duration<double, std::milli>(std::chrono::steady_clock::now() - start).count());
    std::this_thread::sleep_for(50ms);
  }
  const std::string crowd = std::string("another user, ") + GetParam().name + ": ";
  const Latencies latencies = latencies_of(std::move(waits));
  tell_figure(crowd + "good calls", "each within 1 s", written(latencies), latencies.worst <= 1000);
  tell_machine_figure(crowd + "p99 against idle", "5 times", written(latencies.p99 / idle.p99, "times"),
                      latencies.p99 <= 5 * idle.p99);
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

// The service manager listens before the daemon starts: nothing refuses what is attached then.
TEST(PassedSocket, HoldsUpNobodyWithWhatWasAttachedBefore) {
  ScratchRoot root;
  root.ignore_log();
  root.make_directory("/run/quorvel");
  constexpr const char* kService = "com.Orvane.quorveld.sock";
  const Descriptor passed = listen_on(kService);
  ASSERT_EQ(::fcntl(passed.get(), F_SETFD, 0), 0);
  std::vector<SocketPeer> hostile;
  for (int i = 0; i < 6; ++i) {
    hostile.push_back(SocketPeer::connected_to(kService));
    ASSERT_TRUE(send_lingering(hostile.back().descriptor(), calls(1)));
  }
  Program daemon("/bin/bash", {.arguments = {"-c", "exec 3<&" + std::to_string(passed.get()) +
                                                       "; LISTEN_FDS=1 LISTEN_PID=$$ exec " + daemon_program()},
                               .input = {}});
  ASSERT_TRUE(daemon.wait_until_ready());
  for (SocketPeer& peer : hostile) EXPECT_TRUE(peer.is_closed());
  SocketPeer good = SocketPeer::connected_to(kService);
  ASSERT_TRUE(good.send(image_call(1)));
  EXPECT_TRUE(good.receive());
  EXPECT_EQ(daemon.stop().status, 0);
}

INSTANTIATE_TEST_SUITE_P(other_user, OtherUserTest, testing::ValuesIn(kAttacks), testing::PrintToStringParamName());

}  // namespace quorvel::test
