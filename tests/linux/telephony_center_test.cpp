// The telephony layer against a service that is well-behaved, wrong, gone and back.
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
  std::string error = described_error(connection.copy_sim_identity(value));
  all += ", iccid " + described(value) + " " + error;
  error = described_error(connection.copy_postponement_status(value));
  return all + ", postponement " + described(value) + " " + error;
}

class TelephonyService : public testing::Test {
 protected:
  TelephonyService() {
    root.make_directory("/run/quorvel");
    listener = listen_on("telvane.sock");
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
  const std::string rubbish[] = {
      "",                                               // leaves at once
      good.substr(0, good.size() / 2),                  // leaves in the middle
      std::string(16, '\xff'),                          // no frame
      frame_bytes(FrameKind::notification, 0, "name"),  // a frame of somebody else
      event(array({1})),                                // a state that is no dictionary
      event(nullptr),                                   // no state
  };
  serve([&] {
    std::size_t rounds = 0;
    for (const std::string& bytes : rubbish) {
      SocketPeer peer = accept_from(listener);
      EXPECT_TRUE(peer.send(good + bytes));
      EXPECT_TRUE(wait_for_deliveries(++rounds));
      EXPECT_TRUE(rounds <= 2 || peer.is_closed());
    }
  });
  EXPECT_EQ(seen.size(), std::size(rubbish));
  EXPECT_EQ(seen.back(), "sim-status-changed: sim ready, iccid (null) 0.0, postponement (null) 0.0");
}

TEST(TelephonyCenter, OnlyTheOwnerOfTheDirectoryIsTheService) {
  if (::geteuid() != 0) GTEST_SKIP() << "another owner needs root";
  ScratchRoot root;
  root.make_directory("/run/quorvel");
  const Descriptor listener = listen_on("telvane.sock");
  ASSERT_EQ(::chown(root.path("/run/quorvel").c_str(), 12345, 12345), 0);
  EXPECT_EQ(default_telephony_center(), nullptr);
  EXPECT_FALSE(TelephonyConnection::open(nullptr, nullptr));
  EXPECT_EQ(copy_sim_status(), PropertyValue());
}

}  // namespace
}  // namespace quorvel::test
