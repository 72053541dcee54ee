// The daemon under a small limit on descriptors, all of which clients have taken.
#include "stress/hostile_clients.h"
#include "stress/stressed_daemon.h"

namespace quorvel::test {

using Clock = std::chrono::steady_clock;

class DescriptorsTest : public StressedDaemon, public testing::WithParamInterface<int> {
 protected:
  // Connects clients with half a call sent, whom no idleness betrays, until the daemon takes nobody any more.
  void use_up(HostileClients& hostile) {
    const std::size_t before = settled_descriptors();
    do {
      hostile.add_half_calls(1);
    } while (eventually([&] { return descriptors_open(pid()) >= before + hostile.held(); }, 300ms));
    hostile.drop_last();
    EXPECT_GE(hostile.held(), static_cast<std::size_t>(GetParam()) / 4);
  }
  [[nodiscard]] double processor_share(std::chrono::seconds duration) const {
    const auto before = processor_time(pid());
    std::this_thread::sleep_for(duration);
    return 100 * std::chrono::duration<double>(processor_time(pid()) - before) / duration;
  }
  [[nodiscard]] std::string limit() const { return " of " + std::to_string(GetParam()); }
};

TEST_P(DescriptorsTest, OutOfThemTheOldestHalfCallMakesRoom) {
  provision_images(1024);
  start(GetParam());
  HostileClients hostile;
  use_up(hostile);
  const double share = processor_share(2s);
  tell_figure("out of descriptors" + limit() + ", processor used", "5 %", written(share, "%"), share <= 5);

  const double taken = well_behaved_call();
  tell_figure("out of descriptors" + limit() + ", served after", "100 ms", written(taken, "ms"), taken <= 100);
  // The reserve is what the log and a request in flight live on.
  remove_images();
  SocketPeer peer = connected();
  ASSERT_TRUE(peer.send(image_call(1)));
  const auto none = peer.receive();
  EXPECT_TRUE(none && !none->value);
  EXPECT_NE(root.read_file(kLogFile).find("_load_dict: Could not open"), std::string::npos);
  EXPECT_LT(descriptors_open(pid()), static_cast<std::size_t>(GetParam()) - 8) << "no reserve is left";
  expect_quick_end("out of descriptors" + limit());
}

TEST_P(DescriptorsTest, AnIdleCrowdLocksNobodyOut) {
  provision_images(1024);
  start(GetParam());
  HostileClients crowd;
  crowd.add_idle(static_cast<std::size_t>(GetParam()) * 2);
  std::vector<double> waits;
  for (int i = 0; i < 20; ++i) waits.push_back(well_behaved_call());
  const Latencies latencies = latencies_of(std::move(waits));
  tell_figure("an idle crowd of twice the limit" + limit() + ", good client", "all served, worst 10 s",
              written(latencies), latencies.worst <= 10'000);
  EXPECT_LT(descriptors_open(pid()), static_cast<std::size_t>(GetParam()) - 8) << "no reserve is left";
}

INSTANTIATE_TEST_SUITE_P(Limits, DescriptorsTest, testing::Values(64, 256), testing::PrintToStringParamName());

}  // namespace quorvel::test
