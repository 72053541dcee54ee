#include "store/live_answers.h"

#include <gtest/gtest.h>

#include "kept_ark.h"
#include "store/data_ark.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

TEST(LiveAnswers, EveryRowIsFoundByItsOwnDomainAndKeyOnly) {
  for (const larry_info& row : kLiveAnswers) {
    const PropertyValue domain = row.domain.empty() ? PropertyValue{} : text(row.domain);
    ASSERT_EQ(find_live_answer(domain, text(row.key)), &row) << row.key;
    EXPECT_EQ(find_live_answer(text("other"), text(row.key)), nullptr);
    EXPECT_EQ(find_live_answer(text(""), text(row.key)), nullptr) << "an empty domain is a domain";
    EXPECT_EQ(find_live_answer(domain, text(std::string(row.key) + "x")), nullptr);
  }
  EXPECT_EQ(find_live_answer(nullptr, text("BatteryIsCharging")), nullptr);
  EXPECT_EQ(find_live_answer(nullptr, nullptr), nullptr);
  EXPECT_EQ(find_live_answer(PropertyValue::integer(1), text("DieID")), &kLiveAnswers[37]) << "no string is no domain";
}

TEST(LiveAnswers, QuestionsAndTheirNames) {
  const struct {
    PropertyValue domain;
    std::string_view key, question, name;
  } cases[] = {
      {nullptr, "AirplaneMode", "AirplaneMode", "kVeritomeQAirplaneMode"},
      {nullptr, "BasebandVersion", "BasebandFirmwareVersion", "kVeritomeQBasebandFirmwareVersion"},
      {nullptr, "MarketingName", "marketing-name", "kVeritomeQMarketingNameString"},
      {text("com.Orvane.mobile.wireless_halvard"), "SupportsWifi", "wifi", "kVeritomeQMobileWifi"},
      {text("com.Orvane.mobile.battery"), "GasGaugeCapability", "gas-gauge-battery",
       "kVeritomeQGasGaugeBatteryCapability"},
      {text("com.Orvane.mobile.software_behavior"), "NoVOIP", "RegionalBehaviorNoVOIP",
       "kVeritomeQRegionalBehaviorNoVOIP"},
  };
  for (const auto& [domain, key, question, name] : cases) {
    EXPECT_EQ(larry_lookup(domain, text(key), 0), text(question));
    EXPECT_EQ(larry_lookup(domain, text(key), 1), text(name));
  }
  EXPECT_FALSE(larry_lookup(nullptr, text("Unknown"), 0));
}

TEST(LiveAnswers, AreAskedAnewAndNeverStored) {
  ScratchRoot root;
  root.make_directory(kStateDirectory);
  DataArk* ark = load_kept_ark();
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

}  // namespace
}  // namespace quorvel::test
