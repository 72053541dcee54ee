// Where things lie on the device, as seen from the device root. Each path is written here once.
#pragma once

namespace quorvel::paths {

// The daemon's own.
inline constexpr char kMobileHome[] = "/private/var/mobile";
inline constexpr char kStateDirectory[] = "/private/var/mobile/Library/qvd";
inline constexpr char kDataFile[] = "/private/var/mobile/Library/qvd/data_ark.plist";
/// A save writes here first; the six letters are literal.
inline constexpr char kTemporaryDataFile[] = "/private/var/mobile/Library/qvd/data_ark.plist.XXXXXX";
inline constexpr char kDataFileSetAside[] = "/private/var/mobile/Library/qvd/data_ark.plist.unreadable";
inline constexpr char kRegulatoryImages[] = "/private/var/mobile/Library/qvd/regulatory_images/regulatory_images.plist";
/// The log's path runs through the link /var.
inline constexpr char kLogFile[] = "/var/mobile/Library/Logs/quorveld.log";
inline constexpr char kPreviousLogFile[] = "/var/mobile/Library/Logs/quorveld.log.1";
/// Holds a file DOMAIN.plist for each domain.
inline constexpr char kPreferencesDirectory[] = "/private/var/mobile/Library/Preferences";

// The sockets of the daemon and of the telephony service, and what stands beside them.
inline constexpr char kRunDirectory[] = "/run";
inline constexpr char kServiceDirectory[] = "/run/quorvel";
inline constexpr char kTelephonySocket[] = "/run/quorvel/telvane.sock";
inline constexpr char kInstanceLock[] = "/run/quorvel/quorveld.lock";

// Written by packaging, the distribution and the administrator.
inline constexpr char kDeviceInformation[] = "/etc/quorvel/device_information.plist";
/// An empty file: this device has a telephony service.
inline constexpr char kTelephonyMark[] = "/etc/quorvel/telephony";
inline constexpr char kMachineInfo[] = "/etc/machine-info";
inline constexpr char kMachineId[] = "/etc/machine-id";
inline constexpr char kOsRelease[] = "/etc/os-release";
inline constexpr char kDistributionOsRelease[] = "/usr/lib/os-release";

// The kernel's.
inline constexpr char kDeviceTree[] = "/sys/firmware/devicetree/base";
inline constexpr char kFirmwareTable[] = "/sys/class/dmi/id";
inline constexpr char kSystemOnChip[] = "/sys/devices/soc0";
inline constexpr char kNetworkInterfaces[] = "/sys/class/net";
inline constexpr char kWirelessDevices[] = "/sys/class/ieee80211";
inline constexpr char kRadioSwitches[] = "/sys/class/rfkill";
inline constexpr char kModems[] = "/sys/class/wwan";
inline constexpr char kBluetoothAdapter[] = "/sys/class/bluetooth/hci0";
inline constexpr char kPowerSupplies[] = "/sys/class/power_supply";
inline constexpr char kCardDevices[] = "/sys/bus/sdio/devices";
inline constexpr char kProcessors[] = "/proc/cpuinfo";
inline constexpr char kCommandLine[] = "/proc/cmdline";

}  // namespace quorvel::paths
