// Properties out of D-Bus messages, which a stranger may have sent: each function answers a negative error number for
// a message that is not what it should be.
#pragma once

#include <systemd/sd-bus.h>

#include <functional>
#include <string>
#include <string_view>

#include "bridge/reading.h"

namespace quorvel::bridge {

/// Called with a property's name and type; takes its value and answers 1, or 0 to have it skipped.
using TakeProperty = std::function<int(std::string_view name, std::string_view type)>;

/// Goes through an a{sv}.
[[nodiscard]] int each_property(sd_bus_message* message, const TakeProperty& take);

/// Called with an interface's name; takes its a{sv} and answers 1, or 0 to have it skipped.
using TakeInterface = std::function<int(std::string_view name)>;

/// Goes through the interfaces of one object, an a{sa{sv}}, and of all objects, an a{oa{sa{sv}}}.
[[nodiscard]] int each_interface(sd_bus_message* message, const TakeInterface& take);
[[nodiscard]] int each_objects_interface(sd_bus_message* message, const TakeInterface& take);

/// Goes through an as.
[[nodiscard]] int each_text(sd_bus_message* message, const std::function<void(std::string_view text)>& take);

/// Go through the properties of a modem and of its card. `card` receives the card's object path.
[[nodiscard]] int take_modem(sd_bus_message* message, Modem& modem, std::string& card);
[[nodiscard]] int take_card(sd_bus_message* message, Modem& modem);

/// True for the properties of a modem that a reading holds.
[[nodiscard]] bool is_modem_property(std::string_view name);

}  // namespace quorvel::bridge
