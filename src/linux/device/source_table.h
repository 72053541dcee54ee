// Which sources answer which question: the one table. A question that is not in it costs no system call.
#pragma once

#include <array>
#include <string_view>

#include "linux/device/sources/sources.h"
#include "platform/device_questions.h"

namespace quorvel::platform::host {

using Source = DeviceAnswer (*)() noexcept;

struct QuestionSources {
  QuestionName question;
  std::array<Source, 5> sources;  ///< asked in this order until one answers; null behind the last
};

inline constexpr QuestionSources kQuestionSources[] = {
    {"AirplaneMode", {airplane_mode}},
    {"BasebandFirmwareVersion", {baseband_firmware}},
    {"BasebandPostponementStatus", {radio_status}},
    {"BatteryCurrentCapacity", {battery_percentage}},
    {"BatteryIsCharging", {battery_is_charging}},
    {"BatteryIsFullyCharged", {battery_is_full}},
    {"BluetoothAddress", {device_tree_bluetooth_address, bluetooth_address}},
    {"BuildVersion", {system_build, system_image}},
    {"CPUArchitecture", {processor_architecture}},
    {"ChipID", {chip_id}},
    {"EthernetMacAddress", {ethernet_address, device_tree_ethernet_address}},
    {"ExternalChargeCapability", {external_charge_capability}},
    {"ExternalPowerSourceConnected", {external_power_connected}},
    {"FirmwareVersion", {dmi_bios_version, device_tree_boot_loader}},
    {"HWModelStr", {device_tree_board, dmi_board_name, dmi_product_name}},
    {"HardwarePlatform", {device_tree_platform, chip_family}},
    {"HasBaseband", {has_modem, device_tree_baseband}},
    {"InternationalMobileEquipmentIdentity", {equipment_identity}},
    {"MLBSerialNumber", {dmi_board_serial}},
    {"MobileSubscriberCountryCode", {subscriber_country}},
    {"ModelNumber", {hardware_sku_of_administrator, dmi_product_sku}},
    {"ProductType", {device_tree_board, dmi_product_name}},
    {"ProductVersion", {system_version}},
    {"SDIOProductInfo", {card_product}},
    {"SerialNumber", {device_tree_serial, dmi_product_serial, processor_serial, boot_serial}},
    {"UniqueChipID", {unique_chip_id}},
    {"UniqueDeviceID", {derived_device_id}},
    {"WifiAddress", {wireless_address}},
    {"gas-gauge-battery", {battery_has_gauge}},
    {"marketing-name",
     {hardware_model_of_administrator, device_tree_model, dmi_marketing_version, dmi_product_name, dmi_board_name}},
    {"wifi", {has_wireless}},
};

}  // namespace quorvel::platform::host
