// The telephony layer against a service that is well-behaved, wrong, gone and back.
#include <sys/socket.h>
#include <sys/syscall.h>

#include <fstream>

#include "platform/telephony.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::test {
namespace {

using namespace platform;
using wire::FrameKind;

std::string described_error(TelephonyError error) {
  return std::to_string(error.domain) + "." + std::to_string(error.code);
}

// Everything that can be asked, as one text.
std::string everything() {
  std::string all = "sim " + described(copy_sim_status());
  const TelephonyConnection connection = TelephonyConnection::open(nullptr, nullptr);
  if (!connection) return all + ", no connection";
  PropertyValue value;
  std::string error = described_error(connection.query(TelephonyField::sim_identity, value));
  all += ", iccid " + described(value) + " " + error;
  error = described_error(connection.query(TelephonyField::postponement, value));
  return all + ", postponement " + described(value) + " " + error;
}

class TelephonyService : public testing::Test {
 protected:
  struct Late {};

  TelephonyService() : TelephonyService([this] { listener = listen_on("telvane.sock"); }) {}
  explicit TelephonyService(Late) : TelephonyService([this] { root.write_file("/etc/quorvel/telephony", ""); }) {}
  explicit TelephonyService(const std::function<void()>& prepare) {
    root.make_directory("/run/quorvel");
    prepare();
    center = default_telephony_center();
    bind_to_run_loop(center, current_run_loop(), RunLoopMode::default_mode);
  }

  // Runs the main run loop while `script` plays the service on a thread of its own.
  template <typename Script>
  void serve(Script script) {
    std::thread service([&] {
      script();
      ::kill(::getpid(), SIGTERM);
    });
    run_main_run_loop();
    service.join();
  }

  void observe(const PropertyValue& name) { ASSERT_TRUE(add_telephony_observer(center, this, deliver, name)); }

  static void deliver(TelephonyCenter*, void* context, const PropertyValue& name, const PropertyValue& object,
                      const PropertyValue& user_info) noexcept {
    EXPECT_FALSE(object || user_info);
    auto& test = *static_cast<TelephonyService*>(context);
    test.seen.push_back(std::string(name.text()) + ": " + everything());
    ++test.deliveries;
  }

  bool wait_for_deliveries(std::size_t count) {
    return eventually([&] { return deliveries >= count; });
  }

  static std::string event(const PropertyValue& state, std::string_view name = "sim-status-changed") {
    return frame_bytes(FrameKind::event, 0, name, state);
  }

  ScratchRoot root;
  Descriptor listener;
  TelephonyCenter* center = nullptr;
  std::vector<std::string> seen;  // the main thread's; the script counts `deliveries`
  std::atomic<std::size_t> deliveries = 0;
};

TEST_F(TelephonyService, AnswersFromTheLastStateWhateverItHolds) {
  const std::string prefix = "sim-status-changed: ";
  const struct {
    PropertyValue state;
    std::string expected;
  } cases[] = {
      {dictionary({}), "sim (null), iccid (null) 0.0, postponement (null) 0.0"},
      {dictionary({{"sim-status", dictionary({{"Value", "ready"}})},
                   {"iccid", dictionary({{"Value", "89"}, {"Domain", 1}, {"Code", 2}})},
                   {"postponement", dictionary({{"Value", dictionary({{"Status", "NotReady"}})}})}}),
       "sim ready, iccid 89 1.2, postponement " + described(dictionary({{"Status", "NotReady"}})) + " 0.0"},
      {dictionary({{"sim-status", dictionary({{"Value", 1}})},
                   {"iccid", dictionary({{"Value", array({})}, {"Domain", INT64_MIN}, {"Code", UINT64_MAX}})},
                   {"postponement", dictionary({{"Value", "text"}, {"Code", "text"}})}}),
       "sim (null), iccid " + described(array({})) + " -2147483648.2147483647, postponement (null) 0.0"},
      {dictionary({{"sim-status", "ready"}, {"iccid", 1}, {"postponement", array({1})}, {"connection", "text"}}),
       "sim (null), iccid (null) 0.0, postponement (null) 0.0"},
      {dictionary({{"connection", dictionary({{"Domain", 0}, {"Code", -1}})}}), "sim (null), no connection"},
  };
  observe(kSimStatusChanged);
  serve([&] {
    SocketPeer peer = accept_from(listener);
    for (const auto& c : cases) EXPECT_TRUE(peer.send(event(c.state)));
    EXPECT_TRUE(peer.send(event(cases[0].state, "of no interest")));
    EXPECT_TRUE(wait_for_deliveries(std::size(cases)));
  });
  ASSERT_EQ(seen.size(), std::size(cases));
  for (std::size_t i = 0; i < seen.size(); ++i) EXPECT_EQ(seen[i], prefix + cases[i].expected);
}

TEST_F(TelephonyService, ComesBackAfterAServiceThatLeftOrSentRubbish) {
  observe(kSimStatusChanged);
  const std::string good = event(dictionary({{"sim-status", dictionary({{"Value", "ready"}})}}));
  const struct {
    std::string bytes;
    std::string told;
  } rubbish[] = {
      {"", "left"},
      {good.substr(0, good.size() / 2), ""},  // leaves in the middle: the same reason, told once a minute
      {std::string(16, '\xff'), "sent no frame: kind 255"},
      {frame_bytes(FrameKind::notification, 0, "name"), "sent neither a state nor an event: frame of kind 5"},
      {event(array({1})), "sent a state that is no readable property list with a dictionary at its root"},
      {event(nullptr), "sent no state"},
      {std::string("\x20\0\0\0\7\0\0\0\0\0\0\0\0\0\0\0", 16), "body of 536870912 bytes"},
  };
  testing::internal::CaptureStderr();
  const auto begin = std::chrono::steady_clock::now();
  serve([&] {
    std::size_t rounds = 0;
    for (const auto& [bytes, told] : rubbish) {
      SocketPeer peer = accept_from(listener);
      EXPECT_TRUE(peer.send(good + bytes));
      EXPECT_TRUE(wait_for_deliveries(++rounds));
      EXPECT_TRUE(rounds <= 2 || peer.is_closed());
    }
  });
  // After each good frame the pauses begin with the shortest again; seven that grow would be longer.
  EXPECT_LT(std::chrono::steady_clock::now() - begin, 6s);
  const std::string printed = testing::internal::GetCapturedStderr();
  for (const auto& [bytes, told] : rubbish) EXPECT_NE(printed.find(told), std::string::npos) << told << '\n' << printed;
  EXPECT_EQ(std::count(printed.begin(), printed.end(), '\n'), static_cast<std::ptrdiff_t>(std::size(rubbish)) - 1)
      << printed;
  EXPECT_EQ(seen.size(), std::size(rubbish));
  EXPECT_EQ(seen.back(), "sim-status-changed: sim ready, iccid (null) 0.0, postponement (null) 0.0");
  EXPECT_EQ(everything(), "sim (null), no connection");
}

// A device whose service is not there when the daemon starts.
class LateTelephonyService : public TelephonyService {
 protected:
  LateTelephonyService() : TelephonyService(Late()) {}
  void serve_once() {
    listener = listen_on("telvane.sock");
    SocketPeer peer = accept_from(listener);
    EXPECT_TRUE(peer.send(event(dictionary({{"sim-status", dictionary({{"Value", "ready"}})}}))));
    EXPECT_TRUE(wait_for_deliveries(1));
  }
};

// How long the timers of this process that are set still run, in milliseconds; 0 without any.
long longest_timer() {
  long longest = 0;
  for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fdinfo")) {
    std::ifstream file(entry.path());
    for (std::string line; std::getline(file, line);) {
      long seconds = 0, nanoseconds = 0;
      static_cast<void>(std::sscanf(line.c_str(), "it_value: (%ld, %ld", &seconds, &nanoseconds));
      longest = std::max(longest, seconds * 1000 + nanoseconds / 1'000'000);
    }
  }
  return longest;
}

TEST_F(LateTelephonyService, IsFollowedWhenItComes) {
  observe(kSimStatusChanged);
  testing::internal::CaptureStderr();
  serve([&] {
    std::this_thread::sleep_for(50ms);
    EXPECT_EQ(longest_timer(), 0) << "nothing wakes the daemon meanwhile";
    root.write_file("/run/quorvel/other.sock", "");
    root.write_file("/run/quorvel/telvane.sock", "");  // no socket, which the daemon finds
    std::this_thread::sleep_for(50ms);
    serve_once();
  });
  const std::string printed = testing::internal::GetCapturedStderr();
  EXPECT_NE(printed.find("telvane.sock as user"), std::string::npos) << printed;
}

TEST_F(LateTelephonyService, IsLookedForAgainWithinTwoSeconds) {
  testing::internal::CaptureStderr();
  root.write_file("/run/quorvel/telvane.sock", "");  // nobody listens there
  serve([&] {
    EXPECT_TRUE(eventually([] { return longest_timer() >= 1000; })) << "the pauses grow";
    EXPECT_FALSE(eventually([] { return longest_timer() >= 2000; }, 2500ms)) << "but not for ever";
  });
  testing::internal::GetCapturedStderr();
}

TEST_F(LateTelephonyService, IsFoundInADirectoryThatWasMadeAnew) {
  observe(kSimStatusChanged);
  testing::internal::CaptureStderr();
  serve([&] {
    std::filesystem::rename(root.path("/run/quorvel"), root.path("/run/old"));
    root.make_directory("/run/quorvel");
    serve_once();
  });
  EXPECT_NE(testing::internal::GetCapturedStderr(), "");
}

TEST_F(LateTelephonyService, OfAnotherUserIsNotBelieved) {
  if (::geteuid() != 0) GTEST_SKIP() << "another user needs root";
  testing::internal::CaptureStderr();
  serve([&] {
    // A socket is the user's who listened last.
    const Descriptor stranger = listen_on("stranger.sock");
    ASSERT_EQ(::syscall(SYS_setresuid, -1, 12345, -1), 0);  // of this thread alone
    EXPECT_EQ(::listen(stranger.get(), 1), 0);
    ASSERT_EQ(::syscall(SYS_setresuid, -1, 0, -1), 0);
    std::filesystem::rename(root.path("/run/quorvel/stranger.sock"), root.path("/run/quorvel/telvane.sock"));
    EXPECT_TRUE(accept_from(stranger).is_closed());
  });
  const std::string printed = testing::internal::GetCapturedStderr();
  EXPECT_NE(printed.find("of user 12345; only root and user 0, who owns /run/quorvel, are believed"), std::string::npos)
      << printed;
  EXPECT_EQ(everything(), "sim (null), no connection");
}

TEST(TelephonyCenter, DoesNotExistOnADeviceWithoutTelephony) {
  ScratchRoot root;
  root.make_directory("/run/quorvel");
  EXPECT_EQ(default_telephony_center(), nullptr);
  EXPECT_FALSE(TelephonyConnection::open(nullptr, nullptr));
  EXPECT_EQ(copy_sim_status(), PropertyValue());
}

}  // namespace
}  // namespace quorvel::test
