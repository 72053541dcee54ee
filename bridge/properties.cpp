#include "bridge/properties.h"

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <iterator>

namespace quorvel::bridge {
namespace {

constexpr std::size_t kLongestText = 1024;
constexpr std::size_t kMostNumbers = 16;

constexpr std::string_view kModemProperties[] = {
    "State", "StateFailedReason", "UnlockRequired", "Sim", "Revision", "OwnNumbers", "Device", "EquipmentIdentifier"};

int take_text(sd_bus_message* message, char type, std::string& text) {
  const char* read = nullptr;
  const int result = sd_bus_message_read_basic(message, type, &read);
  if (result < 0) return result;
  const std::string_view found(read);
  text = found.substr(0, found.size() <= kLongestText ? found.size() : 0);
  return 1;
}

int take_bytes(sd_bus_message* message, std::string& bytes) {
  const void* read = nullptr;
  std::size_t size = 0;
  const int result = sd_bus_message_read_array(message, 'y', &read, &size);
  if (result < 0) return result;
  bytes.assign(static_cast<const char*>(read), size <= kLongestText ? size : 0);
  return 1;
}

int take_texts(sd_bus_message* message, std::vector<std::string>& texts) {
  texts.clear();
  const int result = each_text(message, [&](std::string_view text) {
    if (texts.size() < kMostNumbers && text.size() <= kLongestText) texts.emplace_back(text);
  });
  return result < 0 ? result : 1;
}

// Goes through an array of dictionary entries of the type `entry`; `take` takes what one holds.
int each_entry(sd_bus_message* message, const char* entry, const std::function<int()>& take) {
  const std::string element = std::string("{") + entry + "}";
  int result = sd_bus_message_enter_container(message, 'a', element.c_str());
  while (result >= 0 && (result = sd_bus_message_enter_container(message, 'e', entry)) > 0) {
    result = take();
    if (result >= 0) result = sd_bus_message_exit_container(message);
  }
  return result < 0 ? result : sd_bus_message_exit_container(message);
}

CardLock lock_of(std::uint32_t number) {
  switch (number) {
    case 0: return CardLock::unknown;
    case 1:  // nothing
    case 3:  // PIN2 and PUK2 do not keep the card from working
    case 5: return CardLock::none;
    case 2: return CardLock::pin;
    case 4: return CardLock::puk;
    default: return CardLock::other;
  }
}

ModemState state_of(std::int32_t state, std::uint32_t failure) {
  if (state == 0 || state == 1) return ModemState::starting;
  if (state != -1) return ModemState::running;
  return failure == 2 ? ModemState::no_card : failure == 3 ? ModemState::card_error : ModemState::failed;
}

}  // namespace

bool is_modem_property(std::string_view name) {
  return std::find(std::begin(kModemProperties), std::end(kModemProperties), name) != std::end(kModemProperties);
}

int each_property(sd_bus_message* message, const TakeProperty& take) {
  return each_entry(message, "sv", [&] {
    const char* name = nullptr;
    const char* type = nullptr;
    int result = sd_bus_message_read_basic(message, 's', &name);
    if (result >= 0) result = sd_bus_message_peek_type(message, nullptr, &type);
    if (result >= 0 && type == nullptr) result = -EBADMSG;
    if (result >= 0) result = sd_bus_message_enter_container(message, 'v', type);
    if (result >= 0 && (result = take(name, type)) == 0) result = sd_bus_message_skip(message, type);
    return result < 0 ? result : sd_bus_message_exit_container(message);
  });
}

int each_interface(sd_bus_message* message, const TakeInterface& take) {
  return each_entry(message, "sa{sv}", [&] {
    const char* name = nullptr;
    int result = sd_bus_message_read_basic(message, 's', &name);
    if (result >= 0 && (result = take(name)) == 0) result = sd_bus_message_skip(message, "a{sv}");
    return result;
  });
}

int each_objects_interface(sd_bus_message* message, const TakeInterface& take) {
  return each_entry(message, "oa{sa{sv}}", [&] {
    const int result = sd_bus_message_skip(message, "o");
    return result < 0 ? result : each_interface(message, take);
  });
}

int each_text(sd_bus_message* message, const std::function<void(std::string_view text)>& take) {
  int result = sd_bus_message_enter_container(message, 'a', "s");
  const char* text = nullptr;
  while (result >= 0 && (result = sd_bus_message_read_basic(message, 's', &text)) > 0) take(text);
  return result < 0 ? result : sd_bus_message_exit_container(message);
}

int take_modem(sd_bus_message* message, Modem& modem, std::string& card) {
  std::int32_t state = 0;
  std::uint32_t failure = 0;
  std::uint32_t lock = 0;
  const int result = each_property(message, [&](std::string_view name, std::string_view type) {
    if (name == "State" && type == "i") return sd_bus_message_read_basic(message, 'i', &state);
    if (name == "StateFailedReason" && type == "u") return sd_bus_message_read_basic(message, 'u', &failure);
    if (name == "UnlockRequired" && type == "u") return sd_bus_message_read_basic(message, 'u', &lock);
    if (name == "Sim" && type == "o") return take_text(message, 'o', card);
    if (name == "Revision" && type == "s") return take_text(message, 's', modem.revision);
    if (name == "Device" && type == "s") return take_text(message, 's', modem.device);
    if (name == "EquipmentIdentifier" && type == "s") return take_text(message, 's', modem.imei);
    if (name == "OwnNumbers" && type == "as") return take_texts(message, modem.numbers);
    return 0;
  });
  modem.state = state_of(state, failure);
  modem.failure = failure;
  modem.lock = lock_of(lock);
  modem.has_card = !card.empty() && card != "/";
  return result;
}

int take_card(sd_bus_message* message, Modem& modem) {
  return each_property(message, [&](std::string_view name, std::string_view type) {
    if (name == "SimIdentifier" && type == "s") return take_text(message, 's', modem.iccid);
    if (name == "Imsi" && type == "s") return take_text(message, 's', modem.imsi);
    if (name == "Gid1" && type == "ay") return take_bytes(message, modem.gid1);
    if (name == "Gid2" && type == "ay") return take_bytes(message, modem.gid2);
    return 0;
  });
}

}  // namespace quorvel::bridge
