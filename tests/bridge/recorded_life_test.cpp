// A modem's life as it was recorded behind the real ModemManager, played to daemons without it.
#include "bridge/life.h"

namespace quorvel::test {
namespace {

TEST(RecordedLife, LeavesTheTracesOfTheRealOne) {
  Device older(Device::Baseband::older);
  Device newer(Device::Baseband::newer);
  Traces older_whole;
  Traces newer_whole;
  for (const Step& step : written_life()) {
    for (const auto& [whole, part] : {std::pair(&older_whole, &step.older), std::pair(&newer_whole, &step.newer)}) {
      whole->lines.insert(whole->lines.end(), part->lines.begin(), part->lines.end());
      whole->posted += part->posted;
    }
  }
  ASSERT_GT(older_whole.lines.size(), 40u);
  for (Device* device : {&older, &newer}) {
    device->start_daemon();
    device->serve(simulator_program(), {"--replay", kRecording, "--speed", "5"});
  }
  for (const auto& [device, whole] : {std::pair(&older, &older_whole), std::pair(&newer, &newer_whole)}) {
    EXPECT_TRUE(device->service->wait_for_output("played", 30s));
    EXPECT_EQ(text_of({"whole life", device->traces(*whole), {}}), text_of({"whole life", *whole, {}}));
    EXPECT_EQ(device->daemon->stop().status, 0);
    device->root.ignore_log();
  }
}

}  // namespace
}  // namespace quorvel::test
