// A good client beside clients that mean harm: it is served as if it were alone, as far as two processors allow.
#include "stress/hostile_clients.h"

#include "quorvel/observer.h"
#include "stress/stressed_daemon.h"

namespace quorvel::test {

using Clock = std::chrono::steady_clock;

constexpr std::size_t kIdle = 1000;
constexpr std::size_t kHalfCalls = 200;
constexpr std::size_t kNeverReading = 64;
constexpr std::size_t kReconnecting = 2;
constexpr std::size_t kGoodImages = 1024;
constexpr std::size_t kLargeImages = 4u << 20;

// Keeps as many processors busy as the active hostile clients do, and nothing else.
class ProcessorHog {
 public:
  ProcessorHog() {
    for (std::size_t i = 0; i < kReconnecting + 1; ++i)
      threads_.emplace_back([this] {
        while (!stopping_) continue;
      });
  }
  ~ProcessorHog() {
    stopping_ = true;
    for (std::thread& thread : threads_) thread.join();
  }

 private:
  std::atomic<bool> stopping_ = false;
  std::vector<std::thread> threads_;
};

class HostileClientsTest : public StressedDaemon {
 protected:
  // Calls of two well-behaved clients, a millisecond or two apart: one connects for each call, one stays connected.
  struct Measured {
    Latencies connecting;
    Latencies connected;
  };
  [[nodiscard]] Measured measured_for(std::chrono::seconds duration) const {
    SocketPeer peer = connected();
    const std::string call = image_call(1);
    std::vector<double> samples[2];
    for (const auto end = Clock::now() + duration; Clock::now() < end;) {
      samples[0].push_back(well_behaved_call());
      std::this_thread::sleep_for(1ms);
      const auto start = Clock::now();
      EXPECT_TRUE(peer.send(call) && peer.receive());
      samples[1].push_back(std::chrono::duration<double, std::milli>(Clock::now() - start).count());
      std::this_thread::sleep_for(1ms);
    }
    return {latencies_of(std::move(samples[0])), latencies_of(std::move(samples[1]))};
  }
  static void tell(const std::string& client, const Latencies& idle, const Latencies& beside_hog,
                   const Latencies& attacked) {
    tell_machine_figure(client + ", idle", "-", written(idle), true);
    tell_machine_figure(client + ", beside a processor hog", "-", written(beside_hog), true);
    tell_machine_figure(client + ", under attack", "p99 at most 5 times its idle p99", written(attacked),
                        attacked.p99 <= 5 * idle.p99);
    tell_machine_figure(client + ", under attack, worst", "100 ms", written(attacked.worst, "ms"),
                        attacked.worst <= 100);
    // What holds on a machine with other things to do as well: nobody is left waiting.
    EXPECT_TRUE(attacked.worst < 2000 || kInstrumented) << client << ": " << written(attacked);
  }
  // Connects everybody who stays, and proves it by the daemon's descriptors and by the replies that have begun.
  void connect_crowd(HostileClients& hostile) {
    const std::size_t before = settled_descriptors();
    provision_images(kLargeImages);
    hostile.add_never_reading(kNeverReading);
    EXPECT_EQ(hostile.wait_for_replies(), kNeverReading);
    provision_images(kGoodImages);
    hostile.add_idle(kIdle);
    hostile.add_half_calls(kHalfCalls);
    EXPECT_TRUE(eventually([&] { return descriptors_open(pid()) >= before + hostile.held(); }))
        << descriptors_open(pid()) - before << " of " << hostile.held() << " are connected";
  }
};

TEST_F(HostileClientsTest, AGoodClientIsServedAsIfAlone) {
  provision_images(kGoodImages);
  start();
  const std::chrono::seconds duration(quick_or_long(4, 8));
  static_cast<void>(measured_for(1s));
  const long idle_kib = resident_kib(pid());
  const std::size_t idle_descriptors = settled_descriptors();
  for (long round = 0; round < quick_or_long(1, 5); ++round) {
    forget_peak(pid());
    const Measured idle = measured_for(duration);
    Measured beside_hog;
    {
      const ProcessorHog hog;
      beside_hog = measured_for(duration);
    }
    Measured attacked;
    {
      HostileClients hostile;
      connect_crowd(hostile);
      for (std::size_t i = 0; i < kReconnecting; ++i) hostile.add_reconnecting();
      hostile.add_flooding();
      attacked = measured_for(duration);
      const std::string counts = std::to_string(hostile.held()) + " held, " + std::to_string(hostile.reconnections()) +
                                 " reconnections, " + std::to_string(hostile.flood_replies()) +
                                 " reads of flood replies";
      tell_figure("hostile clients, connected", "1264, some, some", counts,
                  hostile.held() == kIdle + kHalfCalls + kNeverReading && hostile.reconnections() > 100 &&
                      hostile.flood_replies() > 100);
    }
    tell("good client that connects for each call", idle.connecting, beside_hog.connecting, attacked.connecting);
    tell("good client that stays connected", idle.connected, beside_hog.connected, attacked.connected);
    const double grown = static_cast<double>(peak_resident_kib(pid()) - idle_kib) / 1024;
    const double allowed = 32 + static_cast<double>(kLargeImages) / (1 << 20);
    tell_figure("hostile clients, memory above idle", "32 MiB and one reply of 4 MiB", written(grown, "MiB"),
                grown <= allowed);
    EXPECT_TRUE(eventually([&] { return descriptors_open(pid()) == idle_descriptors; }))
        << descriptors_open(pid()) << " descriptors, at first " << idle_descriptors;
  }
  HostileClients hostile;
  connect_crowd(hostile);
  hostile.add_flooding();
  hostile.add_reconnecting();
  EXPECT_TRUE(eventually([&] { return hostile.flood_replies() > 50 && hostile.reconnections() > 50; }));
  provision_images(kLargeImages);
  hostile.add_never_reading(kNeverReading);  // its large replies are still being made at the end
  expect_quick_end("under attack");
}

TEST_F(HostileClientsTest, ObserversThatNeverReadSlowNobodyDown) {
  const Program simulator(simulator_program());
  client::Options options;
  options.service = "telvane";
  const client::Client telephony(options);
  ASSERT_TRUE(eventually([&] { return !telephony.call("show").error; }));
  start();
  client::Observer good;
  ASSERT_FALSE(good.connect());
  std::vector<client::Observer> bad(64);
  for (client::Observer& observer : bad) ASSERT_FALSE(observer.connect());
  const long before = own_kib(pid());
  constexpr std::uint64_t kAtOnce = 500;
  const auto count = static_cast<std::uint64_t>(quick_or_long(10'000, 100'000)) / kAtOnce * kAtOnce;
  client::Event event;
  std::uint64_t received = 0;
  while (event.sequence < good.first_sequence() + count) {
    const PropertyValue burst = dictionary({{"Name", "phone-number-changed"}, {"Count", kAtOnce}});
    ASSERT_FALSE(telephony.call("notify", burst).error);
    for (std::uint64_t i = 0; i < kAtOnce; ++i) {
      ASSERT_FALSE(good.next(event, kPatience));
      received += event.missed == 0;
    }
  }
  tell_figure("notifications to a good observer beside 64 that never read", "each one",
              std::to_string(received) + " of " + std::to_string(count), received == count);
  const double grown = static_cast<double>(own_kib(pid()) - before) / 1024;
  tell_figure("memory for observers that never read", "1 MiB", written(grown, "MiB"), grown <= 1);
  expect_quick_end("with observers that never read");
}

TEST_F(HostileClientsTest, AClientThatTricklesIsCutOff) {
  if (!is_long_run()) GTEST_SKIP() << "takes half a minute";
  provision_images(kLargeImages);
  start();
  HostileClients hostile;
  hostile.add_never_reading(1);
  ASSERT_EQ(hostile.wait_for_replies(), 1u);
  const auto begun = Clock::now();
  // What the kernel holds can be read after the end, so the end shows as the daemon's descriptor going.
  const std::size_t connections = descriptors_open(pid());
  while (descriptors_open(pid()) >= connections && Clock::now() - begun < 60s) {
    hostile.trickle();
    std::this_thread::sleep_for(100ms);
  }
  const double taken = std::chrono::duration<double>(Clock::now() - begun).count();
  tell_figure("a client that reads ten bytes a second is cut off", "30 s", written(taken, "s"),
              taken > 29 && taken < 33);
}

}  // namespace quorvel::test
