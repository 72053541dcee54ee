// What must hold before the daemon logs its first line, what keeps it from starting, and its notification center.
#include <sched.h>
#include <sys/file.h>
#include <sys/ioctl.h>
#include <sys/resource.h>
#include <sys/socket.h>
#include <sys/un.h>

#include <cstddef>

#include "linux/base/local_socket.h"
#include "linux/notifications/notification_server.h"
#include "linux/process/service_manager.h"
#include "platform/notification_center.h"
#include "platform/process.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::test {
namespace {

using testing::ExitedWithCode;

constexpr const char* kService = "com.example.service";
constexpr const char* kSocket = "com.example.service.sock";

// Starts a process of its own, which ends with what `start_process` returned.
#define EXPECT_START(status, line) \
  EXPECT_EXIT(std::exit(platform::start_process(kService)), ExitedWithCode(status), line)

TEST(ProcessStart, RefusesARootThatIsNoDirectory) {
  ScratchRoot root;
  root.write_file("/file", "");
  for (const std::string& value :
       {std::string(), std::string("relative"), root.path("/file").string(), root.path("/missing").string()}) {
    ::setenv("QUORVEL_ROOT", value.c_str(), 1);
    EXPECT_START(78, "^quorveld: QUORVEL_ROOT must be the absolute path of a directory, which \"" + value +
                         "\" is not: [^\n]*\n$");
  }
}

TEST(ProcessStart, SettlesWhatTheDaemonRestsOn) {
  ScratchRoot root;
  root.remove("/run");
  const auto settled = [&] {
    ::close(STDIN_FILENO);
    ::umask(077);
    rlimit few = {256, 4096};
    ::setrlimit(RLIMIT_NOFILE, &few);
    if (platform::start_process(kService) != 0) return 1;
    if (::getrlimit(RLIMIT_NOFILE, &few) != 0 || few.rlim_cur != 4096) return 5;
    if (root.mode_of("/run/quorvel/quorveld.lock") != 0600) return 6;
    struct stat input;
    if (::fstat(STDIN_FILENO, &input) != 0 || !S_ISCHR(input.st_mode)) return 2;
    if (root.mode_of("/run/quorvel") != 0755 || root.mode_of("/run/quorvel/notifications.sock") != 0666) return 3;
    if (::raise(SIGHUP) != 0 || ::raise(SIGPIPE) != 0 || ::raise(SIGXFSZ) != 0 || ::raise(SIGTERM) != 0) return 4;
    return 0;
  };
  EXPECT_EXIT(std::exit(settled()), ExitedWithCode(0), "^$");
  EXPECT_FALSE(root.exists("/run/quorvel/notifications.sock"));
}

TEST(ProcessStart, RefusesTooFewDescriptors) {
  ScratchRoot root;
  const auto start = [] {
    const rlimit few = {39, 39};
    ::setrlimit(RLIMIT_NOFILE, &few);
    return platform::start_process(kService);
  };
  EXPECT_EXIT(std::exit(start()), ExitedWithCode(71),
              "^quorveld: a limit of 39 descriptors is too low, 40 are needed\n$");
}

// Whatever the service manager passed: numbers beyond it are the daemon's own, opened later, and never taken for it.
TEST(ProcessStart, TakesTheFirstListeningSocketOfThoseThatWerePassed) {
  ScratchRoot root;
  const auto local = [](int type, bool listens) {
    Descriptor socket(::socket(AF_UNIX, type | SOCK_CLOEXEC, 0));
    const sockaddr_un unnamed = {AF_UNIX, {}};
    if (listens) ::bind(socket.get(), reinterpret_cast<const sockaddr*>(&unnamed), sizeof unnamed.sun_family);
    if (listens) ::listen(socket.get(), 1);
    return socket;
  };
  const Descriptor files[] = {local(SOCK_STREAM, true), local(SOCK_STREAM, true), local(SOCK_STREAM, false),
                              local(SOCK_DGRAM, false), Descriptor(::open("/dev/null", O_RDWR | O_CLOEXEC))};
  enum { good, second, deaf, datagram, device };
  const std::string number =
      "quorveld: LISTEN_FDS is \"[^\n]*\", but takes a number of passed descriptors, 1024 at most\n";
  const auto of = [](int count, const char* trouble) {
    return std::string("quorveld: passed descriptors \\(LISTEN_FDS\\) that ") + trouble + ": " + std::to_string(count) +
           "\n";
  };
  const struct {
    const char* announced;
    std::vector<int> passed;
    int taken;  // its position, -1 for none
    std::string lines;
  } cases[] = {
      {"1", {good}, 0, ""},
      {"0", {}, -1, ""},
      {"4", {datagram, device, deaf, good}, 3, of(2, "are no local stream sockets") + of(1, "do not listen")},
      {"2", {datagram, deaf}, -1, of(1, "are no local stream sockets") + of(1, "do not listen")},
      {"2", {good, second}, 0, of(1, "could be served beside the first, which alone is")},
      {"3", {good}, 0, of(2, "are not open")},
      {"2147483647", {good}, 0, number + of(1023, "are not open")},
      {"-1", {good}, -1, number},
      {"x", {good}, -1, number},
      {"", {good}, -1, number},
  };
  for (const auto& c : cases) {
    const auto start = [&] {
      int next = 3;
      std::vector<int> copies;
      for (const int file : c.passed) copies.push_back(::fcntl(files[file].get(), F_DUPFD, 100));
      for (const int copy : copies) ::dup2(copy, next++);
      ::closefrom(next);
      ::setenv("LISTEN_PID", std::to_string(::getpid()).c_str(), 1);
      ::setenv("LISTEN_FDS", c.announced, 1);
      if (const int status = platform::start_process(kService); status != 0) return status;
      const Descriptor taken = platform::host::take_passed_socket();
      return taken.get() == (c.taken < 0 ? -1 : 3 + c.taken) ? 0 : 1;
    };
    EXPECT_EXIT(::_exit(start()), ExitedWithCode(0), "^" + c.lines + "$") << c.announced;
  }
}

TEST(ProcessStart, RefusesASecondInstance) {
  ScratchRoot root;
  root.make_directory("/run/quorvel");
  {
    const Descriptor live = listen_on(kSocket);
    EXPECT_START(69, "^quorveld: another process serves /run/quorvel/com.example.service.sock\n$");
    EXPECT_FALSE(root.exists("/run/quorvel/notifications.sock"));
  }
  EXPECT_START(0, "^$") << "the socket is stale now";
  const Descriptor held(::open(root.path("/run/quorvel/quorveld.lock").c_str(), O_RDWR));
  ASSERT_EQ(::flock(held.get(), LOCK_EX), 0);
  EXPECT_START(69, "^quorveld: another quorveld is running \\(it holds /run/quorvel/quorveld.lock\\)\n$");
}

TEST(ProcessStart, RefusesALockFileThatIsNone) {
  ScratchRoot root;
  root.make_fifo("/run/quorvel/quorveld.lock");
  EXPECT_START(71, "^quorveld: cannot open the lock file [^\n]*\n$");
  root.remove("/run/quorvel/quorveld.lock");
  root.make_link("/decoy", "/run/quorvel/quorveld.lock");
  EXPECT_START(71, "^quorveld: cannot open the lock file [^\n]*\n$");
  EXPECT_FALSE(root.exists("/decoy"));
}

TEST(ProcessStart, RootLeavesNothingInAnothersPlace) {
  if (::geteuid() != 0) GTEST_SKIP() << "needs to be root";
  for (const std::string place : {"/run/quorvel", "/private/var/mobile"}) {
    ScratchRoot root;
    root.make_directory(place);
    ASSERT_EQ(::chown(root.path(place).c_str(), 12345, 12345), 0);
    EXPECT_START(77, "^quorveld: " + place + " belongs to user 12345: [^\n]*systemctl start quorveld\n$");
    EXPECT_FALSE(root.exists("/run/quorvel/quorveld.lock"));
  }
}

TEST(ProcessStart, TellsTheServiceManagerInOneLineWhatItDoes) {
  sockaddr_un address = {AF_UNIX, {}};
  std::string name = "@quorvel-status-" + std::to_string(::getpid());
  name.resize(sizeof address.sun_path, 'n');  // the longest there is
  name.copy(address.sun_path, name.size());
  address.sun_path[0] = '\0';
  const Descriptor manager(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  const auto length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + name.size());
  ASSERT_EQ(::bind(manager.get(), reinterpret_cast<const sockaddr*>(&address), length), 0);
  ::setenv("NOTIFY_SOCKET", name.c_str(), 1);
  for (const auto& [text, told] : {std::pair<std::string, std::string>{"Listening", "STATUS=Listening"},
                                   {"one\nREADY=1", "STATUS=one"},
                                   {std::string(1000, 'x'), "STATUS=" + std::string(248, 'x')}}) {
    platform::host::report_status(text);
    char message[512];
    const ssize_t size = ::recv(manager.get(), message, sizeof message, MSG_DONTWAIT);
    EXPECT_EQ(std::string(message, static_cast<std::size_t>(std::max<ssize_t>(size, 0))), told);
  }
}

TEST(ProcessStart, ReplacesOnlySocketsThatNobodyServes) {
  using platform::host::ListeningSocket;
  ScratchRoot root(std::string(150, 'l'));
  root.write_file("/run/quorvel/a.sock", "kept");
  EXPECT_FALSE(ListeningSocket::open("a.sock"));
  EXPECT_EQ(errno, EEXIST);
  EXPECT_EQ(root.read_file("/run/quorvel/a.sock"), "kept");
  root.remove("/run/quorvel/a.sock");
  static_cast<void>(listen_on("a.sock"));
  {
    const ListeningSocket socket = ListeningSocket::open("a.sock");
    EXPECT_TRUE(socket);
    EXPECT_EQ(root.mode_of("/run/quorvel/a.sock"), 0666u);
    EXPECT_FALSE(ListeningSocket::open("a.sock"));
    EXPECT_EQ(errno, EADDRINUSE);
    // A link to a socket is taken inside the device root, as every path is.
    root.make_link("/run/quorvel/a.sock", "/run/quorvel/inwards.sock");
    root.make_link(root.path("/run/quorvel/a.sock").string(), "/run/quorvel/outwards.sock");
    EXPECT_TRUE(platform::host::connect_local("inwards.sock"));
    EXPECT_FALSE(platform::host::connect_local("outwards.sock"));
  }
  {
    const ListeningSocket socket = ListeningSocket::open("b.sock");
    root.remove("/run/quorvel/b.sock");
    root.write_file("/run/quorvel/b.sock", "another's");
  }
  if (::geteuid() == 0) {
    ASSERT_EQ(::chown(root.path("/run/quorvel").c_str(), 12345, 12345), 0);
    const ListeningSocket socket = ListeningSocket::open("c.sock");
    struct stat status;
    ASSERT_EQ(::lstat(root.path("/run/quorvel/c.sock").c_str(), &status), 0);
    EXPECT_EQ(status.st_uid, 12345u) << "root serves the directory's owner";
  }
  EXPECT_EQ(root.read_file("/run/quorvel/b.sock"), "another's");
  EXPECT_FALSE(root.exists("/run/quorvel/a.sock"));
  EXPECT_FALSE(ListeningSocket::open(std::string(100, 'n')));
  EXPECT_EQ(errno, ENAMETOOLONG);
}

using platform::post_notification;
using wire::FrameKind;

class NotificationCenter : public testing::Test {
 protected:
  NotificationCenter() { EXPECT_EQ(platform::start_process(), 0); }

  static SocketPeer observer() { return SocketPeer::connected_to("notifications.sock"); }

  ScratchRoot root;
};

TEST_F(NotificationCenter, WhoeverIsConnectedBeforeAPostReceivesIt) {
  const std::size_t open_before = descriptors_open();
  for (std::int64_t i = 1; i <= 300; ++i) {
    SocketPeer peer = observer();
    post_notification(text("com.example.changed"), PropertyValue::integer(i));
    const auto ready = peer.receive();
    ASSERT_TRUE(ready);
    ASSERT_EQ(ready->kind, FrameKind::ready);
    std::uint64_t serial = ready->serial;
    while (serial < static_cast<std::uint64_t>(i)) {
      const auto notification = peer.receive();
      ASSERT_TRUE(notification) << "notification " << i << " after ready " << ready->serial;
      ASSERT_EQ(notification->kind, FrameKind::notification);
      ASSERT_EQ(notification->serial, ++serial);
      EXPECT_EQ(notification->name, "com.example.changed");
      EXPECT_EQ(notification->value, PropertyValue::integer(static_cast<std::int64_t>(serial)));
    }
    ASSERT_LE(ready->serial, static_cast<std::uint64_t>(i - 1));
  }
  EXPECT_TRUE(eventually([&] { return descriptors_open() == open_before; }));
}

TEST_F(NotificationCenter, ASlowObserverIsToldHowManyItMissed) {
  SocketPeer slow = observer();
  SocketPeer rude = observer();
  static_cast<void>(rude.send(std::string(50'000, '?')));
  const PropertyValue object = text(std::string(1000, 'o'));
  constexpr std::uint64_t count = 10'000;
  for (std::uint64_t i = 1; i < count; ++i) {
    // One that has no name on the wire counts like the others.
    post_notification(i == count - 3 ? text("a\nb") : text("name"), object);
  }
  post_notification(text("last"), nullptr);
  for (SocketPeer* peer : {&slow, &rude}) {
    std::uint64_t serial = peer->receive()->serial;
    std::uint64_t missed = 0;
    while (serial < count) {
      const auto frame = peer->receive();
      ASSERT_TRUE(frame) << "after " << serial;
      if (frame->kind == FrameKind::missed) {
        missed += *frame->value.to_uint64();
        serial += *frame->value.to_uint64();
      } else {
        ++serial;
      }
      ASSERT_EQ(frame->serial, serial);
      EXPECT_EQ(frame->name == "last", serial == count);
    }
    EXPECT_GT(missed, 1000u);
  }
  SocketPeer late = observer();
  EXPECT_EQ(late.receive()->serial, count);
}

TEST_F(NotificationCenter, AUserOfManyObserversHasLittleRoomForMoreOfThem) {
  std::vector<SocketPeer> peers;
  while (peers.size() < 17) ASSERT_TRUE(peers.emplace_back(observer()).receive());
  for (int i = 0; i < 1000; ++i) post_notification(text("name"), text(std::string(1000, 'o')));
  const auto unread = [](const SocketPeer& peer) {
    int bytes = 0;
    return ::ioctl(peer.descriptor(), FIONREAD, &bytes) == 0 ? bytes : -1;
  };
  EXPECT_TRUE(eventually([&] { return unread(peers.front()) > 50'000; })) << unread(peers.front());
  EXPECT_LT(unread(peers.back()), 16'000);
}

// Keeps the center's thread from running while the calling one does: both have one processor, and where it is allowed
// the calling one goes before everybody else.
void hold_back_the_center() {
  cpu_set_t one;
  CPU_ZERO(&one);
  CPU_SET(static_cast<std::size_t>(::sched_getcpu()), &one);
  for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
    EXPECT_EQ(::sched_setaffinity(std::stoi(task.path().filename()), sizeof one, &one), 0);
  }
  const sched_param first = {1};
  static_cast<void>(::sched_setscheduler(0, SCHED_FIFO, &first));
}

// The second one is posted, and the end begins, while the center serves its observers the first one.
TEST_F(NotificationCenter, DeliversWhatWasPostedJustBeforeTheEnd) {
  SocketPeer first = observer(), other = observer();
  ASSERT_TRUE(first.receive() && other.receive());
  hold_back_the_center();
  post_notification(text("one"), nullptr);
  ASSERT_TRUE(first.receive());
  post_notification(text("last"), nullptr);
  platform::host::notification_server().stop();
  const auto notification = first.receive();
  ASSERT_TRUE(notification);
  EXPECT_EQ(notification->name, "last");
}

}  // namespace
}  // namespace quorvel::test
