// The names of keys and domains of the data ark, each written once for everybody who uses it.
#pragma once

#include "property/value.h"

namespace quorvel::keys {

// Domains.
inline constexpr StaticText kInternalDomain = "com.Orvane.mobile.internal";
inline constexpr StaticText kInternationalDomain = "com.Orvane.international";
inline constexpr StaticText kWirelessDomain = "com.Orvane.mobile.wireless_halvard";
inline constexpr StaticText kBatteryDomain = "com.Orvane.mobile.battery";
inline constexpr StaticText kSoftwareBehaviorDomain = "com.Orvane.mobile.software_behavior";
inline constexpr StaticText kPairedHostsDomain = "com.Orvane.mobile.halvard.paired_hosts";
inline constexpr StaticText kBackupDomain = "com.Orvane.mobile.backup";
inline constexpr StaticText kDiskUsageDomain = "com.Orvane.disk_usage";
inline constexpr StaticText kFactoryDiskUsageDomain = "com.Orvane.disk_usage.factory";

// Keys that are stored.
inline constexpr StaticText kPreviousSIMStatus = "PreviousSIMStatus";
inline constexpr StaticText kBasebandBootloaderVersion = "BasebandBootloaderVersion";
inline constexpr StaticText kSIMGID1 = "SIMGID1";
inline constexpr StaticText kSIMGID2 = "SIMGID2";
inline constexpr StaticText kIntegratedCircuitCardIdentity = "IntegratedCircuitCardIdentity";
inline constexpr StaticText kInternationalMobileSubscriberIdentity = "InternationalMobileSubscriberIdentity";
inline constexpr StaticText kDebugDockPresent = "DebugDockPresent";
inline constexpr StaticText kSIMStatus = "SIMStatus";
inline constexpr StaticText kPhoneNumber = "PhoneNumber";
inline constexpr StaticText kUntrustedHostBUID = "UntrustedHostBUID";
inline constexpr StaticText kVersion = "Version";
inline constexpr StaticText kMobileApplicationUsage = "MobileApplicationUsage";

// Keys that the device-information service answers.
inline constexpr StaticText kAirplaneMode = "AirplaneMode";
inline constexpr StaticText kApNonce = "ApNonce";
inline constexpr StaticText kBasebandFirmwareManifestData = "BasebandFirmwareManifestData";
inline constexpr StaticText kBasebandSerialNumber = "BasebandSerialNumber";
inline constexpr StaticText kBasebandChipId = "BasebandChipId";
inline constexpr StaticText kChipID = "ChipID";
inline constexpr StaticText kBoardId = "BoardId";
inline constexpr StaticText kInternationalMobileEquipmentIdentity = "InternationalMobileEquipmentIdentity";
inline constexpr StaticText kMobileEquipmentIdentifier = "MobileEquipmentIdentifier";
inline constexpr StaticText kBasebandRegionSKU = "BasebandRegionSKU";
inline constexpr StaticText kBasebandKeyHashInformation = "BasebandKeyHashInformation";
inline constexpr StaticText kSIMTrayStatus = "SIMTrayStatus";
inline constexpr StaticText kCarrierBundleInfoArray = "CarrierBundleInfoArray";
inline constexpr StaticText kBasebandGoldCertId = "BasebandGoldCertId";
inline constexpr StaticText kBasebandCertId = "BasebandCertId";
inline constexpr StaticText kUniqueDeviceID = "UniqueDeviceID";
inline constexpr StaticText kActiveWirelessTechnology = "ActiveWirelessTechnology";
inline constexpr StaticText kFirmwarePreflightInfo = "FirmwarePreflightInfo";
inline constexpr StaticText kBasebandVersion = "BasebandVersion";
inline constexpr StaticText kSerialNumber = "SerialNumber";
inline constexpr StaticText kMLBSerialNumber = "MLBSerialNumber";
inline constexpr StaticText kModelNumber = "ModelNumber";
inline constexpr StaticText kRegulatoryModelNumber = "RegulatoryModelNumber";
inline constexpr StaticText kRegionInfo = "RegionInfo";
inline constexpr StaticText kWiFiAddress = "WiFiAddress";
inline constexpr StaticText kEthernetAddress = "EthernetAddress";
inline constexpr StaticText kBluetoothAddress = "BluetoothAddress";
inline constexpr StaticText kHardwareModel = "HardwareModel";
inline constexpr StaticText kMarketingName = "MarketingName";
inline constexpr StaticText kBuildVersion = "BuildVersion";
inline constexpr StaticText kProductVersion = "ProductVersion";
inline constexpr StaticText kReleaseType = "ReleaseType";
inline constexpr StaticText kCPUArchitecture = "CPUArchitecture";
inline constexpr StaticText kFirmwareVersion = "FirmwareVersion";
inline constexpr StaticText kProductionSOC = "ProductionSOC";
inline constexpr StaticText kUniqueChipID = "UniqueChipID";
inline constexpr StaticText kSupportedDeviceFamilies = "SupportedDeviceFamilies";
inline constexpr StaticText kDieID = "DieID";
inline constexpr StaticText kDeviceColor = "DeviceColor";
inline constexpr StaticText kDeviceEnclosureColor = "DeviceEnclosureColor";
inline constexpr StaticText kDeviceRGBColor = "DeviceRGBColor";
inline constexpr StaticText kDeviceEnclosureRGBColor = "DeviceEnclosureRGBColor";
inline constexpr StaticText kSoftwareBundleVersion = "SoftwareBundleVersion";
inline constexpr StaticText kSDIOProductInfo = "SDIOProductInfo";
inline constexpr StaticText kSDIOManufacturerTuple = "SDIOManufacturerTuple";
inline constexpr StaticText kWifiVendor = "WifiVendor";
inline constexpr StaticText kInverseDeviceID = "InverseDeviceID";
inline constexpr StaticText kPartitionType = "PartitionType";
inline constexpr StaticText kProximitySensorCalibration = "ProximitySensorCalibration";
inline constexpr StaticText kProximitySensorCalibrationDictionary = "ProximitySensorCalibrationDictionary";
inline constexpr StaticText kCompassCalibration = "CompassCalibration";
inline constexpr StaticText kCompassCalibrationDictionary = "CompassCalibrationDictionary";
inline constexpr StaticText kBasebandBoardSerialNumber = "BasebandBoardSerialNumber";
inline constexpr StaticText kWirelessBoardSerialNumber = "WirelessBoardSerialNumber";
inline constexpr StaticText kHardwarePlatform = "HardwarePlatform";
inline constexpr StaticText kBasebandNonce = "BasebandNonce";
inline constexpr StaticText kMobileSubscriberNetworkCode = "MobileSubscriberNetworkCode";
inline constexpr StaticText kMobileSubscriberCountryCode = "MobileSubscriberCountryCode";
inline constexpr StaticText kDeviceVariantGuess = "DeviceVariantGuess";
inline constexpr StaticText kDeviceVariant = "DeviceVariant";
inline constexpr StaticText kBasebandPostponementStatus = "BasebandPostponementStatus";
inline constexpr StaticText kBootManifestHash = "BootManifestHash";
inline constexpr StaticText kBootNonce = "BootNonce";
inline constexpr StaticText kCertificateProductionStatus = "CertificateProductionStatus";
inline constexpr StaticText kCertificateSecurityMode = "CertificateSecurityMode";
inline constexpr StaticText kEffectiveProductionStatus = "EffectiveProductionStatus";
inline constexpr StaticText kEffectiveProductionStatusAp = "EffectiveProductionStatusAp";
inline constexpr StaticText kEffectiveProductionStatusKorv = "EffectiveProductionStatusKorv";
inline constexpr StaticText kEffectiveSecurityMode = "EffectiveSecurityMode";
inline constexpr StaticText kEffectiveSecurityModeAp = "EffectiveSecurityModeAp";
inline constexpr StaticText kEffectiveSecurityModeKorv = "EffectiveSecurityModeKorv";
inline constexpr StaticText kTessel4Supported = "Tessel4Supported";
inline constexpr StaticText kMixAndMatchPrevention = "MixAndMatchPrevention";
inline constexpr StaticText kHasKorv = "HasKorv";
inline constexpr StaticText kKorvNonce = "KorvNonce";
inline constexpr StaticText kRegionCode = "RegionCode";
inline constexpr StaticText kSysCfgData = "SysCfgData";
inline constexpr StaticText kDiagData = "DiagData";
inline constexpr StaticText kCarrierBuild = "CarrierBuild";
inline constexpr StaticText kIsInternal = "IsInternal";
inline constexpr StaticText kUIBuild = "UIBuild";
inline constexpr StaticText kSupportedKeyboards = "SupportedKeyboards";
inline constexpr StaticText kSupportsWifi = "SupportsWifi";
inline constexpr StaticText kBatteryIsCharging = "BatteryIsCharging";
inline constexpr StaticText kExternalConnected = "ExternalConnected";
inline constexpr StaticText kFullyCharged = "FullyCharged";
inline constexpr StaticText kExternalChargeCapable = "ExternalChargeCapable";
inline constexpr StaticText kBatteryCurrentCapacity = "BatteryCurrentCapacity";
inline constexpr StaticText kGasGaugeCapability = "GasGaugeCapability";
inline constexpr StaticText kSoftwareBehavior = "SoftwareBehavior";
inline constexpr StaticText kValid = "Valid";
inline constexpr StaticText kGoogleMail = "GoogleMail";
inline constexpr StaticText kVolumeLimit = "VolumeLimit";
inline constexpr StaticText kShutterClick = "ShutterClick";
inline constexpr StaticText kNTSC = "NTSC";
inline constexpr StaticText kNoWiFi = "NoWiFi";
inline constexpr StaticText kNoVOIP = "NoVOIP";

}  // namespace quorvel::keys
