// The questions that the device-information service is asked: each one's name, and the kind and unit of its answer.
#pragma once

#include <algorithm>
#include <cstddef>
#include <string_view>

#include "property/node.h"

namespace quorvel::platform {

struct DeviceQuestion {
  std::string_view name;
  PropertyKind kind = PropertyKind::none;  ///< none: a value of any kind, which only packaging can give
  std::string_view unit = {};              ///< empty where the kind says it all
};

/// Sorted by name.
inline constexpr DeviceQuestion kDeviceQuestions[] = {
    {"ActiveWirelessTechnology"},
    {"AirplaneMode", PropertyKind::boolean},
    {"ApNonce"},
    {"BasebandBoardSnum"},
    {"BasebandCertId"},
    {"BasebandChipId"},
    {"BasebandFirmwareManifestData"},
    {"BasebandFirmwareVersion", PropertyKind::string},
    {"BasebandKeyHashInformation"},
    {"BasebandPostponementStatus", PropertyKind::string},
    {"BasebandRegionSKU"},
    {"BasebandSerialNumber"},
    {"BatteryCurrentCapacity", PropertyKind::integer, "percent"},
    {"BatteryIsCharging", PropertyKind::boolean},
    {"BatteryIsFullyCharged", PropertyKind::boolean},
    {"BluetoothAddress", PropertyKind::string, "address"},
    {"BoardId"},
    {"BootManifestHash"},
    {"BootNonce"},
    {"BuildVersion", PropertyKind::string},
    {"CPUArchitecture", PropertyKind::string},
    {"CarrierBundleInfoArray"},
    {"CarrierInstallCapability"},
    {"CertificateProductionStatus"},
    {"CertificateSecurityMode"},
    {"ChipID", PropertyKind::integer},
    {"CompassCalibration"},
    {"CompassCalibrationDictionary"},
    {"DeviceColor"},
    {"DeviceEnclosureColor"},
    {"DeviceEnclosureRGBColor"},
    {"DeviceRGBColor"},
    {"DeviceVariant"},
    {"DeviceVariantGuess"},
    {"DiagData"},
    {"DieId"},
    {"EffectiveProductionStatus"},
    {"EffectiveProductionStatusAp"},
    {"EffectiveProductionStatusKorv"},
    {"EffectiveSecurityMode"},
    {"EffectiveSecurityModeAp"},
    {"EffectiveSecurityModeKorv"},
    {"EthernetMacAddress", PropertyKind::string, "address"},
    {"ExternalChargeCapability", PropertyKind::boolean},
    {"ExternalPowerSourceConnected", PropertyKind::boolean},
    {"FirmwareNonce"},
    {"FirmwarePreflightInfo"},
    {"FirmwareVersion", PropertyKind::string},
    {"HWModelStr", PropertyKind::string},
    {"HardwarePlatform", PropertyKind::string},
    {"HasBaseband", PropertyKind::boolean},
    {"HasKorv"},
    {"InternalBuild"},
    {"InternationalMobileEquipmentIdentity", PropertyKind::string},
    {"InverseDeviceID"},
    {"IsUIBuild"},
    {"KorvNonce"},
    {"MLBSerialNumber", PropertyKind::string},
    {"MixAndMatchPrevention"},
    {"MobileEquipmentIdentifier"},
    {"MobileSubscriberCountryCode", PropertyKind::string},
    {"MobileSubscriberNetworkCode", PropertyKind::string},
    {"ModelNumber", PropertyKind::string},
    {"PartitionType"},
    {"ProductType", PropertyKind::string},
    {"ProductVersion", PropertyKind::string},
    {"ProximitySensorCalibration"},
    {"ProximitySensorCalibrationDictionary"},
    {"RegionCode"},
    {"RegionInfo"},
    {"RegionalBehaviorGoogleMail"},
    {"RegionalBehaviorNTSC"},
    {"RegionalBehaviorNoVOIP"},
    {"RegionalBehaviorNoWiFi"},
    {"RegionalBehaviorShutterClick"},
    {"RegionalBehaviorValid"},
    {"RegionalBehaviorVolumeLimit"},
    {"RegulatoryModelNumber"},
    {"ReleaseType", PropertyKind::string},
    {"SDIOManufacturerTuple"},
    {"SDIOProductInfo", PropertyKind::string},
    {"SIMTrayStatus"},
    {"SerialNumber", PropertyKind::string},
    {"SigningFuse"},
    {"SoftwareBehavior"},
    {"SoftwareBundleVersion"},
    {"SupportedDeviceFamilies"},
    {"SupportedKeyboards"},
    {"SysCfg"},
    {"Tessel4Supported"},
    {"UniqueChipID", PropertyKind::integer},
    {"UniqueDeviceID", PropertyKind::string},
    {"WifiAddress", PropertyKind::string, "address"},
    {"WifiVendor"},
    {"WirelessBoardSnum"},
    {"gas-gauge-battery", PropertyKind::boolean},
    {"marketing-name", PropertyKind::string},
    {"wifi", PropertyKind::boolean},
};
inline constexpr std::size_t kDeviceQuestionCount = std::size(kDeviceQuestions);
static_assert(std::ranges::is_sorted(kDeviceQuestions, {}, &DeviceQuestion::name));

/// The place of a question in the table, or kDeviceQuestionCount.
[[nodiscard]] constexpr std::size_t find_question_place(std::string_view name) noexcept {
  const auto* const row = std::ranges::lower_bound(kDeviceQuestions, name, {}, &DeviceQuestion::name);
  const auto place = static_cast<std::size_t>(row - std::begin(kDeviceQuestions));
  return place < kDeviceQuestionCount && row->name == name ? place : kDeviceQuestionCount;
}

/// The row of a question, or null.
[[nodiscard]] constexpr const DeviceQuestion* find_device_question(std::string_view name) noexcept {
  const std::size_t place = find_question_place(name);
  return place < kDeviceQuestionCount ? &kDeviceQuestions[place] : nullptr;
}

/// The name of a question of the table above; one that is not in it does not compile.
class QuestionName {
 public:
  consteval QuestionName(std::string_view name)  // not explicit: reads as the name it is
      : place_(find_question_place(name)) {
    if (place_ == kDeviceQuestionCount) detail::refuse_to_compile("no question of the table has this name");
  }
  consteval QuestionName(const char* name) : QuestionName(std::string_view(name)) {}
  constexpr operator std::string_view() const noexcept { return kDeviceQuestions[place_].name; }
  /// The question's place in the table.
  [[nodiscard]] constexpr std::size_t index() const noexcept { return place_; }

 private:
  std::size_t place_;
};

}  // namespace quorvel::platform
