// Six threads over everything that threads share, beside the main run loop with telephony deliveries. Made for the
// thread sanitizer; in other builds it shows that nothing stands still.
#include <array>

#include "core/quorvel_daemon.h"
#include "core/quorveld_startup.h"
#include "device/device_type.h"
#include "log/daemon_log.h"
#include "platform/ipc.h"
#include "platform/process.h"
#include "platform/run_loop.h"
#include "platform/telephony.h"
#include "protocol/quorvel_protocol.h"
#include "stress/stressed_daemon.h"

namespace quorvel::test {

constexpr std::size_t kThreads = 6;

class Threads {
 public:
  explicit Threads(DataArk* ark) : ark_(ark) {
    const PropertyValue name = text("com.example.changed");
    EXPECT_EQ(data_ark_register_notification(ark, text("d"), text("key1"), name, kEventSet | kEventChanged), 0);
    telephony_.service = "telvane";
  }
  void start() {
    const std::function<void(long)> work[kThreads] = {
        [this](long i) { write(i); }, [this](long i) { write(i + 3); },
        [this](long i) { read(i); },  [](long i) { daemon_log(0, "thread", "%s %ld", kLongText.c_str(), i); },
        [this](long i) { ask(i); },   [this](long i) { telephone(i); },
    };
    for (std::size_t at = 0; at < kThreads; ++at) {
      threads_[at] = std::thread([this, at, step = work[at]] {
        for (long i = 0; !stopping_; ++i, ++rounds_[at]) step(i);
      });
    }
  }
  void stop() {
    stopping_ = true;
    for (std::thread& thread : threads_) thread.join();
  }
  [[nodiscard]] long fewest_rounds() const { return *std::min_element(rounds_.begin(), rounds_.end()); }

 private:
  void write(long i) {
    const PropertyValue key = text("key" + std::to_string(i % 40));
    static_cast<void>(data_ark_set(ark_, text("d"), key, array({i, i})));
    if (i % 5 == 0) static_cast<void>(data_ark_remove_extended(ark_, text("d"), key, i % 2 == 0));
    if (i % 14 == 0) static_cast<void>(data_ark_add_to_class(ark_, text("d"), key, static_cast<unsigned>(i % 9)));
    if (i % 50 == 0) data_ark_store(ark_);
  }
  void read(long i) {
    const PropertyValue pair = data_ark_copy(ark_, text("d"), text("key" + std::to_string(i % 40)));
    EXPECT_EQ(pair.at(0), pair.at(1));
    const PropertyValue view = data_ark_copy(ark_, text("d"), nullptr);
    for (const auto& [name, value] : view.entries()) EXPECT_EQ(value.at(0), value.at(1));
    EXPECT_EQ(data_ark_copy(ark_, nullptr, text("SerialNumber")), text("S1"));
    EXPECT_FALSE(has_new_baseband());
    EXPECT_EQ(get_device_type_internal().baseband_class, 1);
  }
  void ask(long i) {
    const client::Reply reply = client::Client().copy_regulatory_images();
    EXPECT_FALSE(reply.error) << reply.error->description;
    EXPECT_EQ(reply.value.size(), 1u);
    if (i % 3 == 0) static_cast<void>(client::Client().call("noSuchOperation:", text("argument")));
  }
  void telephone(long i) {
    const client::Client telephony(telephony_);
    EXPECT_FALSE(telephony.call("set", dictionary({{"Field", "iccid"}, {"Value", std::to_string(i)}})).error);
    EXPECT_FALSE(telephony.call("notify", dictionary({{"Name", "sim-status-changed"}, {"Count", 3}})).error);
  }

  static inline const std::string kLongText = std::string(1500, 'l');
  DataArk* ark_;
  client::Options telephony_;
  std::atomic<bool> stopping_ = false;
  std::array<std::atomic<long>, kThreads> rounds_ = {};
  std::array<std::thread, kThreads> threads_;
};

TEST(ThreadsTest, WorkOnEverythingAtOnce) {
  ScratchRoot root;
  root.ignore_log();
  root.write_plist("/etc/quorvel/device_information.plist", dictionary({{"SerialNumber", "S1"}}));
  root.write_file("/sys/firmware/devicetree/base/baseband/class", std::string("\1\0\0\0", 4));
  root.write_plist(std::string(kStateDirectory) + "/regulatory_images/regulatory_images.plist",
                   dictionary({{"Rest of World", "image"}}));
  Program simulator(simulator_program());
  ASSERT_TRUE(simulator.wait_until_ready());
  ASSERT_EQ(platform::start_process(protocol::kServiceName), 0);
  platform::TelephonyCenter* center = platform::default_telephony_center();
  ASSERT_NE(center, nullptr);
  platform::bind_to_run_loop(center, platform::current_run_loop(), platform::RunLoopMode::default_mode);
  DataArk* ark = quorveld_startup();
  QuorvelDaemon daemon;
  daemon.set_dark(ark);
  platform::IpcListener* listener = platform::create_listener(protocol::kServiceName);
  platform::set_delegate(listener, {&daemon, QuorvelDaemon::accept});
  ASSERT_EQ(platform::resume(listener), 0);
  Threads threads(ark);
  threads.start();
  std::thread timer([&threads] {
    std::this_thread::sleep_for(std::chrono::seconds(is_long_run() ? 60 : 5));
    threads.stop();
    ::kill(::getpid(), SIGTERM);
  });
  platform::run_main_run_loop();
  timer.join();
  tell_figure("threads: rounds of the slowest of six", "10", std::to_string(threads.fewest_rounds()),
              threads.fewest_rounds() >= 10);
  EXPECT_TRUE(root.exists(std::string(kLogFile) + ".1")) << "the log was never rotated";
  EXPECT_TRUE(root.exists(kDataFile)) << "the data ark was never stored";
  platform::release_listener(listener);
}

}  // namespace quorvel::test
