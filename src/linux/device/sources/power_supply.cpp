#include <algorithm>
#include <cstring>

#include "linux/device/sources/reading.h"
#include "linux/device/sources/sources.h"
#include "platform/device_paths.h"
#include "platform/directory_listing.h"

namespace quorvel::platform::host {

namespace {

constexpr std::size_t kMostBatteries = 16;

enum class Charge { unknown, charging, discharging, held, full };

// What is in a battery beside what it can hold, in one unit.
struct Level {
  std::int64_t now = 0;
  std::int64_t full = 0;
  [[nodiscard]] bool is_known() const noexcept { return now >= 0 && full > 0; }
};

struct Battery {
  Charge charge = Charge::unknown;
  std::optional<std::int64_t> capacity;
  Level energy;
  Level electricity;
  bool has_gauge = false;
  bool counts_now = false;  // it tells what is in it, not only a share
  char device[1024] = {};
};

struct Power {
  Battery batteries[kMostBatteries];
  std::size_t count = 0;
  bool supply_is_readable = false;
  bool supply_is_online = false;
  [[nodiscard]] std::span<const Battery> all() const noexcept { return {batteries, count}; }
  [[nodiscard]] bool any(Charge charge) const noexcept {
    return std::ranges::count(all(), charge, &Battery::charge) > 0;
  }
};

[[nodiscard]] std::optional<std::int64_t> number(std::string_view name, std::string_view file) noexcept {
  return SourceFile(SourcePath(paths::kPowerSupplies, name, file)).integer();
}

[[nodiscard]] Charge charge_of(std::string_view name) noexcept {
  const SourceFile file(SourcePath(paths::kPowerSupplies, name, "status"));
  const std::string_view status = file.text();
  if (status == "Charging") return Charge::charging;
  if (status == "Discharging") return Charge::discharging;
  if (status == "Not charging") return Charge::held;
  return status == "Full" ? Charge::full : Charge::unknown;
}

[[nodiscard]] Level level(std::optional<std::int64_t> now, std::optional<std::int64_t> full) noexcept {
  return {now.value_or(-1), full.value_or(-1)};
}

// False for an entry that measures nothing, such as a charger that calls itself a battery.
[[nodiscard]] bool read_battery(std::string_view name, Battery& battery) noexcept {
  battery.charge = charge_of(name);
  battery.capacity = number(name, "capacity");
  const auto energy_now = number(name, "energy_now");
  const auto energy_full = number(name, "energy_full");
  const auto charge_now = number(name, "charge_now");
  const auto charge_full = number(name, "charge_full");
  battery.energy = level(energy_now, energy_full);
  battery.electricity = level(charge_now, charge_full);
  battery.counts_now = energy_now || charge_now;
  battery.has_gauge = battery.counts_now || number(name, "charge_counter");
  static_cast<void>(target_path(SourcePath(paths::kPowerSupplies, name, "device"), battery.device));
  return battery.capacity || battery.has_gauge || energy_full || charge_full;
}

// A gauge and a charger may both speak for one cell; the one that counts what is in it is believed.
void add_battery(Power& power, std::string_view name) noexcept {
  Battery battery;
  if (!read_battery(name, battery)) return;
  for (Battery& other : std::span(power.batteries, power.count)) {
    if (battery.device[0] == '\0' || std::strcmp(battery.device, other.device) != 0) continue;
    if (battery.counts_now && !other.counts_now) other = battery;
    return;
  }
  if (power.count < kMostBatteries) power.batteries[power.count++] = battery;
}

void add_supply(Power& power, std::string_view name) noexcept {
  const auto online = number(name, "online");
  power.supply_is_readable |= online.has_value();
  power.supply_is_online |= online.value_or(0) >= 1;
}

// A mouse's battery and a tablet pen's are not the machine's.
[[nodiscard]] Power read_power() noexcept {
  Power power;
  const DirectoryListing listing(paths::kPowerSupplies);
  for (const char* name : listing) {
    if (SourceFile(SourcePath(paths::kPowerSupplies, name, "scope")).text() == "Device") continue;
    const SourceFile file(SourcePath(paths::kPowerSupplies, name, "type"));
    const std::string_view type = file.text();
    if (type == "Battery") {
      if (number(name, "present").value_or(1) == 1) add_battery(power, name);
    } else if (type.starts_with("Mains") || type.starts_with("USB") || type == "Wireless") {
      add_supply(power, name);
    }
  }
  return power;
}

[[nodiscard]] int share(long double now, long double full) noexcept {
  // Wide enough that no product overflows and whole percents are exact.
  return static_cast<int>(std::min(100.0L, now * 100.0L / full));
}

[[nodiscard]] int percent(const Battery& battery) noexcept {
  if (battery.capacity && *battery.capacity >= 0)
    return static_cast<int>(std::min<std::int64_t>(*battery.capacity, 100));
  if (battery.energy.is_known()) {
    return share(static_cast<long double>(battery.energy.now), static_cast<long double>(battery.energy.full));
  }
  if (!battery.electricity.is_known()) return -1;
  return share(static_cast<long double>(battery.electricity.now), static_cast<long double>(battery.electricity.full));
}

// The share of all batteries together where each of them tells this kind of level; -1 otherwise.
[[nodiscard]] int joint_percent(const Power& power, Level Battery::*kind) noexcept {
  long double now = 0;
  long double full = 0;
  for (const Battery& battery : power.all()) {
    const Level& one = battery.*kind;
    if (!one.is_known()) return -1;
    now += static_cast<long double>(one.now);
    full += static_cast<long double>(one.full);
  }
  return share(now, full);
}

[[nodiscard]] int mean_percent(const Power& power) noexcept {
  int sum = 0;
  int known = 0;
  for (const Battery& battery : power.all()) {
    const int one = percent(battery);
    if (one < 0) continue;
    sum += one;
    ++known;
  }
  return known == 0 ? -1 : sum / known;
}

[[nodiscard]] int percent_of_all(const Power& power) noexcept {
  if (power.count == 0) return -1;
  if (power.count == 1) return percent(power.batteries[0]);
  for (Level Battery::*kind : {&Battery::energy, &Battery::electricity}) {
    if (const int joint = joint_percent(power, kind); joint >= 0) return joint;
  }
  return mean_percent(power);
}

[[nodiscard]] DeviceAnswer yes_or_no(bool value) noexcept {
  return answer_from(PropertyValue::boolean(value), paths::kPowerSupplies);
}

[[nodiscard]] bool all_unknown(const Power& power) noexcept {
  return std::ranges::all_of(power.all(), [](const Battery& one) { return one.charge == Charge::unknown; });
}

[[nodiscard]] DeviceAnswer external_power(const Power& power) noexcept {
  if (power.supply_is_readable) return yes_or_no(power.supply_is_online);
  if (power.any(Charge::charging)) return yes_or_no(true);
  return power.any(Charge::discharging) ? yes_or_no(false) : DeviceAnswer{};
}

}  // namespace

DeviceAnswer battery_is_charging() noexcept {
  const Power power = read_power();
  return all_unknown(power) ? DeviceAnswer{} : yes_or_no(power.any(Charge::charging));
}

// A battery that a charge limit holds below the top is not full.
DeviceAnswer battery_is_full() noexcept {
  const Power power = read_power();
  if (all_unknown(power)) return {};
  const auto is_full_or_unknown = [](const Battery& one) {
    return one.charge == Charge::full || one.charge == Charge::unknown;
  };
  const auto is_at_the_top = [](const Battery& one) {
    return one.charge == Charge::full || (one.charge == Charge::held && percent(one) == 100);
  };
  return yes_or_no(std::ranges::all_of(power.all(), is_full_or_unknown) ||
                   std::ranges::all_of(power.all(), is_at_the_top));
}

DeviceAnswer external_power_connected() noexcept { return external_power(read_power()); }

DeviceAnswer external_charge_capability() noexcept {
  const Power power = read_power();
  return power.count == 0 ? DeviceAnswer{} : external_power(power);
}

DeviceAnswer battery_percentage() noexcept {
  const int value = percent_of_all(read_power());
  return value < 0 ? DeviceAnswer{} : answer_from(PropertyValue::integer(value), paths::kPowerSupplies);
}

DeviceAnswer battery_has_gauge() noexcept {
  const Power power = read_power();
  return power.count == 0 ? DeviceAnswer{} : yes_or_no(std::ranges::any_of(power.all(), &Battery::has_gauge));
}

}  // namespace quorvel::platform::host
