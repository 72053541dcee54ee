// Keys that the device answers: which they are, and what a slow answer holds up.
#include "store/live_answers.h"

#include <sys/syscall.h>

#include "store/data_ark.h"
#include "support/scratch_root.h"

namespace {

// Reads on a thread that asks for it wait until they are let go, as those of a battery's driver may.
thread_local bool reads_are_slow = false;
std::atomic<int> slow_reads = 0;
std::atomic<bool> slow_reads_may_end = false;

}  // namespace

extern "C" ssize_t read(int descriptor, void* bytes, std::size_t size) {
  if (reads_are_slow) {
    ++slow_reads;
    slow_reads_may_end.wait(false);
  }
  return ::syscall(SYS_read, descriptor, bytes, size);
}

namespace quorvel::test {

TEST(LiveAnswers, EveryRowIsFoundByItsOwnDomainAndKeyOnly) {
  for (const larry_info& row : kLiveAnswers) {
    const PropertyValue domain = row.domain.empty() ? PropertyValue{} : text(row.domain);
    ASSERT_EQ(find_live_answer(domain, text(row.key)), &row) << row.key;
    EXPECT_EQ(find_live_answer(text("other"), text(row.key)), nullptr);
    EXPECT_EQ(find_live_answer(text(""), text(row.key)), nullptr) << "an empty domain is a domain";
    EXPECT_EQ(find_live_answer(domain, text(std::string(row.key) + "x")), nullptr);
    EXPECT_EQ(larry_lookup(domain, text(row.key), 0), text(row.question));
    EXPECT_TRUE(larry_lookup(domain, text(row.key), 1)
                    .text()
                    .ends_with(row.question_name.empty() ? row.question : row.question_name));
    EXPECT_FALSE(larry_lookup(domain, text(row.key), 2));
  }
  EXPECT_EQ(find_live_answer(nullptr, text("BatteryIsCharging")), nullptr);
  EXPECT_EQ(find_live_answer(nullptr, nullptr), nullptr);
  EXPECT_EQ(find_live_answer(nullptr, text("")), nullptr);
  EXPECT_EQ(find_live_answer(PropertyValue::integer(1), text("DieID")), &kLiveAnswers[37]) << "no string is no domain";
}

TEST(LiveAnswers, AreAskedAnewAndNeverStored) {
  ScratchRoot root;
  root.make_directory(kStateDirectory);
  static DataArk* const ark = data_ark_load();
  const auto answer = [&](const char* version) {
    root.write_plist("/etc/quorvel/device_information.plist", dictionary({{"ProductVersion", version}}));
    return data_ark_copy(ark, nullptr, text("ProductVersion"));
  };
  data_ark_set(ark, nullptr, text("ProductVersion"), text("stored"));
  data_ark_set(ark, nullptr, text("MarketingName"), text("stored"));
  static_cast<void>(root.log_lines());
  EXPECT_EQ(answer("1.0"), text("1.0"));
  EXPECT_EQ(answer("1.1"), text("1.1"));
  EXPECT_EQ(data_ark_exists(ark, nullptr, text("ProductVersion")), 1);
  EXPECT_EQ(data_ark_exists(ark, nullptr, text("DieID")), 0);
  EXPECT_FALSE(data_ark_copy(ark, nullptr, text("MarketingName")));
  EXPECT_FALSE(data_ark_copy(ark, nullptr, text("DieID")));
  root.expect_log(
      {"data_ark_copy_with_conn_state: the device-information service returned nothing for "
       "kVeritomeQMarketingNameString",
       "data_ark_copy_with_conn_state: the device-information service returned nothing for "
       "kVeritomeQDieId"});
}

TEST(LiveAnswers, AReadThatTakesItsTimeHoldsUpNobody) {
  ScratchRoot root;
  root.make_directory(kStateDirectory);
  root.write_file("/sys/class/power_supply/BAT0/type", "Battery");
  root.write_file("/sys/class/power_supply/BAT0/capacity", "57");
  static DataArk* const ark = data_ark_load();
  std::thread slow([&] {
    reads_are_slow = true;
    EXPECT_EQ(data_ark_copy(ark, text("com.Orvane.mobile.battery"), text("BatteryCurrentCapacity")),
              PropertyValue::integer(57));
  });
  EXPECT_TRUE(eventually([] { return slow_reads > 0; }));
  EXPECT_EQ(data_ark_copy(ark, text("com.Orvane.mobile.battery"), text("GasGaugeCapability")),
            PropertyValue::boolean(false));
  EXPECT_EQ(data_ark_set(ark, nullptr, text("key"), text("value")), 0);
  data_ark_store(ark);
  EXPECT_EQ(root.read_plist(kDataFile), dictionary({{"-key", "value"}}));
  slow_reads_may_end = true;
  slow_reads_may_end.notify_all();
  slow.join();
  root.ignore_log();
}

}  // namespace quorvel::test
