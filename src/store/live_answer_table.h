// The live-answer table: which keys the device-information service answers, and by which question.
#pragma once

#include <array>
#include <string_view>

#include "platform/device_questions.h"
#include "store/key_names.h"

namespace quorvel {

/// One row. A row without a domain matches only a read without one.
struct larry_info {
  std::string_view domain;  // empty: none
  std::string_view key;
  std::string_view question;
  std::string_view question_name;  // empty: kQuestionNamePrefix and the question
};

inline constexpr std::string_view kQuestionNamePrefix = "kVeritomeQ";

namespace detail {

using platform::QuestionName;

template <std::size_t Size>
consteval larry_info ask(const StaticText<Size>& key) {
  return {{}, key.text(), QuestionName(key.text()), {}};
}
template <std::size_t Size>
consteval larry_info ask(const StaticText<Size>& key, QuestionName question, std::string_view question_name = {}) {
  return {{}, key.text(), question, question_name};
}
template <std::size_t DomainSize, std::size_t Size>
consteval larry_info ask(const StaticText<DomainSize>& domain, const StaticText<Size>& key, QuestionName question,
                         std::string_view question_name = {}) {
  return {domain.text(), key.text(), question, question_name};
}

}  // namespace detail

inline constexpr std::array kLiveAnswers = {
    detail::ask(keys::kAirplaneMode),
    detail::ask(keys::kApNonce),
    detail::ask(keys::kBasebandFirmwareManifestData),
    detail::ask(keys::kBasebandSerialNumber),
    detail::ask(keys::kBasebandChipId),
    detail::ask(keys::kChipID),
    detail::ask(keys::kBoardId),
    detail::ask(keys::kInternationalMobileEquipmentIdentity),
    detail::ask(keys::kMobileEquipmentIdentifier),
    detail::ask(keys::kBasebandRegionSKU),
    detail::ask(keys::kBasebandKeyHashInformation),
    detail::ask(keys::kSIMTrayStatus),
    detail::ask(keys::kCarrierBundleInfoArray),
    detail::ask(keys::kBasebandGoldCertId, "BasebandCertId"),
    detail::ask(keys::kBasebandCertId),
    detail::ask(keys::kUniqueDeviceID),
    detail::ask(keys::kActiveWirelessTechnology),
    detail::ask(keys::kFirmwarePreflightInfo),
    detail::ask(keys::kBasebandVersion, "BasebandFirmwareVersion"),
    detail::ask(keys::kSerialNumber),
    detail::ask(keys::kMLBSerialNumber),
    detail::ask(keys::kModelNumber),
    detail::ask(keys::kRegulatoryModelNumber),
    detail::ask(keys::kRegionInfo),
    detail::ask(keys::kWiFiAddress, "WifiAddress"),
    detail::ask(keys::kEthernetAddress, "EthernetMacAddress"),
    detail::ask(keys::kBluetoothAddress),
    detail::ask(keys::kHardwareModel, "HWModelStr"),
    detail::ask(keys::kMarketingName, "marketing-name", "kVeritomeQMarketingNameString"),
    detail::ask(keys::kBuildVersion),
    detail::ask(keys::kProductVersion),
    detail::ask(keys::kReleaseType),
    detail::ask(keys::kCPUArchitecture),
    detail::ask(keys::kFirmwareVersion),
    detail::ask(keys::kProductionSOC, "SigningFuse"),
    detail::ask(keys::kUniqueChipID),
    detail::ask(keys::kSupportedDeviceFamilies),
    detail::ask(keys::kDieID, "DieId"),
    detail::ask(keys::kDeviceColor),
    detail::ask(keys::kDeviceEnclosureColor),
    detail::ask(keys::kDeviceRGBColor),
    detail::ask(keys::kDeviceEnclosureRGBColor),
    detail::ask(keys::kSoftwareBundleVersion),
    detail::ask(keys::kSDIOProductInfo),
    detail::ask(keys::kSDIOManufacturerTuple),
    detail::ask(keys::kWifiVendor),
    detail::ask(keys::kInverseDeviceID),
    detail::ask(keys::kPartitionType),
    detail::ask(keys::kProximitySensorCalibration),
    detail::ask(keys::kProximitySensorCalibrationDictionary),
    detail::ask(keys::kCompassCalibration),
    detail::ask(keys::kCompassCalibrationDictionary),
    detail::ask(keys::kBasebandBoardSerialNumber, "BasebandBoardSnum"),
    detail::ask(keys::kWirelessBoardSerialNumber, "WirelessBoardSnum"),
    detail::ask(keys::kHardwarePlatform),
    detail::ask(keys::kBasebandNonce, "FirmwareNonce"),
    detail::ask(keys::kMobileSubscriberNetworkCode),
    detail::ask(keys::kMobileSubscriberCountryCode),
    detail::ask(keys::kDeviceVariantGuess),
    detail::ask(keys::kDeviceVariant),
    detail::ask(keys::kBasebandPostponementStatus),
    detail::ask(keys::kBootManifestHash),
    detail::ask(keys::kBootNonce),
    detail::ask(keys::kCertificateProductionStatus),
    detail::ask(keys::kCertificateSecurityMode),
    detail::ask(keys::kEffectiveProductionStatus),
    detail::ask(keys::kEffectiveProductionStatusAp),
    detail::ask(keys::kEffectiveProductionStatusKorv),
    detail::ask(keys::kEffectiveSecurityMode),
    detail::ask(keys::kEffectiveSecurityModeAp),
    detail::ask(keys::kEffectiveSecurityModeKorv),
    detail::ask(keys::kTessel4Supported),
    detail::ask(keys::kMixAndMatchPrevention),
    detail::ask(keys::kHasKorv),
    detail::ask(keys::kKorvNonce),
    detail::ask(keys::kRegionCode),
    detail::ask(keys::kInternalDomain, keys::kSysCfgData, "SysCfg"),
    detail::ask(keys::kInternalDomain, keys::kDiagData, keys::kDiagData.text()),
    detail::ask(keys::kInternalDomain, keys::kCarrierBuild, "CarrierInstallCapability"),
    detail::ask(keys::kInternalDomain, keys::kIsInternal, "InternalBuild"),
    detail::ask(keys::kInternalDomain, keys::kUIBuild, "IsUIBuild"),
    detail::ask(keys::kInternationalDomain, keys::kSupportedKeyboards, keys::kSupportedKeyboards.text()),
    detail::ask(keys::kWirelessDomain, keys::kSupportsWifi, "wifi", "kVeritomeQMobileWifi"),
    detail::ask(keys::kBatteryDomain, keys::kBatteryIsCharging, keys::kBatteryIsCharging.text()),
    detail::ask(keys::kBatteryDomain, keys::kExternalConnected, "ExternalPowerSourceConnected"),
    detail::ask(keys::kBatteryDomain, keys::kFullyCharged, "BatteryIsFullyCharged"),
    detail::ask(keys::kBatteryDomain, keys::kExternalChargeCapable, "ExternalChargeCapability"),
    detail::ask(keys::kBatteryDomain, keys::kBatteryCurrentCapacity, keys::kBatteryCurrentCapacity.text()),
    detail::ask(keys::kBatteryDomain, keys::kGasGaugeCapability, "gas-gauge-battery",
                "kVeritomeQGasGaugeBatteryCapability"),
    detail::ask(keys::kSoftwareBehavior),
    detail::ask(keys::kSoftwareBehaviorDomain, keys::kValid, "RegionalBehaviorValid"),
    detail::ask(keys::kSoftwareBehaviorDomain, keys::kGoogleMail, "RegionalBehaviorGoogleMail"),
    detail::ask(keys::kSoftwareBehaviorDomain, keys::kVolumeLimit, "RegionalBehaviorVolumeLimit"),
    detail::ask(keys::kSoftwareBehaviorDomain, keys::kShutterClick, "RegionalBehaviorShutterClick"),
    detail::ask(keys::kSoftwareBehaviorDomain, keys::kNTSC, "RegionalBehaviorNTSC"),
    detail::ask(keys::kSoftwareBehaviorDomain, keys::kNoWiFi, "RegionalBehaviorNoWiFi"),
    detail::ask(keys::kSoftwareBehaviorDomain, keys::kNoVOIP, "RegionalBehaviorNoVOIP"),
};
static_assert(kLiveAnswers.size() == 97);

}  // namespace quorvel
