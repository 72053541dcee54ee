// The sources of live answers. Each function reads one thing anew and gives an answer with its origin, or none; any
// thread may call it. A new fact is a function in the file of what knows it, and its name in source_table.h.
#pragma once

#include "platform/device_information.h"

namespace quorvel::platform::host {

// machine_description.cpp: what the distribution and the administrator wrote.
[[nodiscard]] DeviceAnswer hardware_model_of_administrator() noexcept;
[[nodiscard]] DeviceAnswer hardware_sku_of_administrator() noexcept;
[[nodiscard]] DeviceAnswer system_version() noexcept;
[[nodiscard]] DeviceAnswer system_build() noexcept;
[[nodiscard]] DeviceAnswer system_image() noexcept;
[[nodiscard]] DeviceAnswer derived_device_id() noexcept;

// device_tree.cpp
[[nodiscard]] DeviceAnswer device_tree_board() noexcept;
[[nodiscard]] DeviceAnswer device_tree_platform() noexcept;
[[nodiscard]] DeviceAnswer device_tree_model() noexcept;
[[nodiscard]] DeviceAnswer device_tree_serial() noexcept;
[[nodiscard]] DeviceAnswer device_tree_boot_loader() noexcept;
[[nodiscard]] DeviceAnswer device_tree_ethernet_address() noexcept;
[[nodiscard]] DeviceAnswer device_tree_bluetooth_address() noexcept;
[[nodiscard]] DeviceAnswer device_tree_baseband() noexcept;

// dmi.cpp: the table that a PC's firmware keeps.
[[nodiscard]] DeviceAnswer dmi_product_name() noexcept;
[[nodiscard]] DeviceAnswer dmi_board_name() noexcept;
[[nodiscard]] DeviceAnswer dmi_marketing_version() noexcept;
[[nodiscard]] DeviceAnswer dmi_product_sku() noexcept;
[[nodiscard]] DeviceAnswer dmi_product_serial() noexcept;
[[nodiscard]] DeviceAnswer dmi_board_serial() noexcept;
[[nodiscard]] DeviceAnswer dmi_bios_version() noexcept;

// processor.cpp
[[nodiscard]] DeviceAnswer chip_family() noexcept;
[[nodiscard]] DeviceAnswer chip_id() noexcept;
[[nodiscard]] DeviceAnswer unique_chip_id() noexcept;
[[nodiscard]] DeviceAnswer processor_serial() noexcept;
[[nodiscard]] DeviceAnswer boot_serial() noexcept;
[[nodiscard]] DeviceAnswer processor_architecture() noexcept;

// network.cpp
[[nodiscard]] DeviceAnswer ethernet_address() noexcept;
[[nodiscard]] DeviceAnswer wireless_address() noexcept;
[[nodiscard]] DeviceAnswer card_product() noexcept;

// radio.cpp
[[nodiscard]] DeviceAnswer airplane_mode() noexcept;
[[nodiscard]] DeviceAnswer has_wireless() noexcept;
[[nodiscard]] DeviceAnswer has_modem() noexcept;
[[nodiscard]] DeviceAnswer bluetooth_address() noexcept;

// telephony.cpp
[[nodiscard]] DeviceAnswer baseband_firmware() noexcept;
[[nodiscard]] DeviceAnswer equipment_identity() noexcept;
[[nodiscard]] DeviceAnswer radio_status() noexcept;
[[nodiscard]] DeviceAnswer subscriber_country() noexcept;

// power_supply.cpp
[[nodiscard]] DeviceAnswer battery_is_charging() noexcept;
[[nodiscard]] DeviceAnswer battery_is_full() noexcept;
[[nodiscard]] DeviceAnswer external_power_connected() noexcept;
[[nodiscard]] DeviceAnswer external_charge_capability() noexcept;
[[nodiscard]] DeviceAnswer battery_percentage() noexcept;
[[nodiscard]] DeviceAnswer battery_has_gauge() noexcept;

}  // namespace quorvel::platform::host
