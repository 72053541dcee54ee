// The telephony service as the daemon sees it. The service pushes its whole state with every notification, and queries
// are answered from the last state received, so nothing here waits for anybody. Main thread only.
#pragma once

#include <cstdint>

#include "platform/run_loop.h"
#include "property/value.h"

namespace quorvel::platform {

/// A query's outcome; a non-zero code is a failure.
struct TelephonyError {
  std::int32_t domain = 0;
  std::int32_t code = 0;
};

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

/// A server connection for one run of queries; holds on to the state it was opened with.
class TelephonyConnection {
 public:
  using Callback = void (*)(void* context) noexcept;
  /// Empty when the service is away, or refuses connections. `callback` is told of events on the connection, of which
  /// a service that pushes its state has none to tell.
  [[nodiscard]] static TelephonyConnection open(Callback callback, void* context) noexcept;
  [[nodiscard]] explicit operator bool() const noexcept { return static_cast<bool>(state_); }

  /// Each fills `value` with what the service delivers, which may be none and of any kind, and returns the error pair.
  TelephonyError copy_sim_identity(PropertyValue& value) const noexcept;
  TelephonyError copy_mobile_subscriber_identity(PropertyValue& value) const noexcept;
  TelephonyError copy_firmware_version(PropertyValue& value) const noexcept;
  TelephonyError copy_bootloader_version(PropertyValue& value) const noexcept;
  TelephonyError copy_gid1(PropertyValue& value) const noexcept;
  TelephonyError copy_gid2(PropertyValue& value) const noexcept;
  /// Delivers a dictionary or none: a radio info of another kind counts as not delivered.
  TelephonyError copy_postponement_status(PropertyValue& value) const noexcept;

 private:
  TelephonyError copy(std::string_view field, PropertyValue& value) const noexcept;
  PropertyValue state_;
};

/// The SIM status last reported, a string, or none. Needs no connection.
[[nodiscard]] PropertyValue copy_sim_status() noexcept;

}  // namespace quorvel::platform
