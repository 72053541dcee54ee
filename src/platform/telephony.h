// The telephony service as the daemon sees it. The service pushes its whole state with every notification, and queries
// are answered from the last state received, so nothing here waits for anybody. The center belongs to the main thread,
// queries to any.
#pragma once

#include <cstddef>
#include <cstdint>
#include <iterator>
#include <string_view>

#include "platform/run_loop.h"
#include "property/value.h"

namespace quorvel::platform {

/// A query's outcome; a non-zero code is a failure.
struct TelephonyError {
  std::int32_t domain = 0;
  std::int32_t code = 0;
};

/// The queries that a connection answers.
enum class TelephonyField : std::uint8_t {
  sim_identity,
  mobile_subscriber_identity,
  firmware_version,
  bootloader_version,
  gid1,
  gid2,
  postponement,
};

inline constexpr StaticText kIccidField = "iccid";
inline constexpr StaticText kImsiField = "imsi";
inline constexpr StaticText kFirmwareVersionField = "firmware-version";
inline constexpr StaticText kBootloaderVersionField = "bootloader-version";
inline constexpr StaticText kGid1Field = "gid1";
inline constexpr StaticText kGid2Field = "gid2";
inline constexpr StaticText kPostponementField = "postponement";

/// A query's field in the service's state, and its name in the log. A new field is a row here, its enumerator and its
/// name above.
struct TelephonyFieldRow {
  TelephonyField field;
  std::string_view name;
  const char* query;
};

inline constexpr TelephonyFieldRow kTelephonyFields[] = {
    {TelephonyField::sim_identity, kIccidField.text(), "_TelvaneServerConnectionCopySIMIdentity"},
    {TelephonyField::mobile_subscriber_identity, kImsiField.text(),
     "_TelvaneServerConnectionCopyMobileSubscriberIdentity"},
    {TelephonyField::firmware_version, kFirmwareVersionField.text(), "_TelvaneServerConnectionCopyFirmwareVersion"},
    {TelephonyField::bootloader_version, kBootloaderVersionField.text(),
     "_TelvaneServerConnectionCopyBootloaderVersion"},
    {TelephonyField::gid1, kGid1Field.text(), "_TelvaneServerConnectionCopyGid1"},
    {TelephonyField::gid2, kGid2Field.text(), "_TelvaneServerConnectionCopyGid2"},
    {TelephonyField::postponement, kPostponementField.text(), "_TelvaneServerConnectionCopyPostponementStatus"},
};

[[nodiscard]] constexpr const TelephonyFieldRow& row_of(TelephonyField field) noexcept {
  return kTelephonyFields[static_cast<std::size_t>(field)];
}

// The rows stand in the order of the enumerators.
static_assert([] {
  for (std::size_t i = 0; i < std::size(kTelephonyFields); ++i) {
    if (kTelephonyFields[i].field != static_cast<TelephonyField>(i)) return false;
  }
  return true;
}());

inline constexpr StaticText kSimNewlyInserted = "sim-newly-inserted";
inline constexpr StaticText kSimStatusChanged = "sim-status-changed";
inline constexpr StaticText kPhoneNumberChanged = "phone-number-changed";
inline constexpr StaticText kPostponementStatusChanged = "postponement-status-changed";

inline constexpr StaticText kPostponementStatusKey = "Status";
inline constexpr StaticText kPostponementErrorReasonKey = "ErrorReason";
inline constexpr StaticText kPostponementStatusError = "Error";
inline constexpr StaticText kPostponementStatusNotReady = "NotReady";

class TelephonyCenter;

using TelephonyObserver = void (*)(TelephonyCenter* center, void* context, const PropertyValue& name,
                                   const PropertyValue& object, const PropertyValue& user_info) noexcept;

/// The default notification center: exists when the device has a telephony service, that is when
/// /etc/quorvel/telephony is there or anything stands at the place of the service's socket at the first call; null for
/// the life of the process otherwise. Bound to a run loop, it connects whenever the service can be reached. Borrowed.
[[nodiscard]] TelephonyCenter* default_telephony_center() noexcept;

/// Has the center's deliveries made on `loop`.
void bind_to_run_loop(TelephonyCenter* center, RunLoop* loop, RunLoopMode mode) noexcept;

/// Calls `observer` for every delivery of `name` from now on. False when memory runs out.
[[nodiscard]] bool add_telephony_observer(TelephonyCenter* center, void* context, TelephonyObserver observer,
                                          const PropertyValue& name) noexcept;

/// Takes `state`, a dictionary, for the last state received; none while the service is away. The center does so with
/// each push, and a process without a center may do so with a state of its own. Any thread.
void keep_telephony_state(PropertyValue state) noexcept;

/// A server connection for one run of queries; holds on to the state it was opened with. Any thread.
class TelephonyConnection {
 public:
  using Callback = void (*)(void* context) noexcept;
  /// Empty when the service is away, or refuses connections. `callback` is told of events on the connection, of which
  /// a service that pushes its state has none to tell.
  [[nodiscard]] static TelephonyConnection open(Callback callback, void* context) noexcept;
  [[nodiscard]] explicit operator bool() const noexcept { return static_cast<bool>(state_); }

  /// Fills `value` with the service's answer, which may be none and of any kind, and returns the error pair. A radio
  /// info (`postponement`) that is no dictionary counts as not delivered.
  TelephonyError query(TelephonyField field, PropertyValue& value) const noexcept;

 private:
  PropertyValue state_;
};

/// The SIM status last reported, a string, or none. Needs no connection. Any thread.
[[nodiscard]] PropertyValue copy_sim_status() noexcept;

}  // namespace quorvel::platform
