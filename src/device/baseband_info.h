// One run of the telephony facts collector, for either kind of baseband. Main thread only.
#pragma once

#include "property/value.h"
#include "store/data_ark.h"

namespace quorvel {

/// The system notification that every run posts.
inline constexpr StaticText kPhoneNumberChangedNotification = "com.Orvane.mobile.halvard.phone_number_changed";

/// Collects the facts of the baseband that the device has into `ark`.
void lookup_baseband_info(DataArk* ark) noexcept;

/// Stores what the radio reports beside its status, once it is ready.
void lookup_baseband_info_new(DataArk* ark) noexcept;

/// Asks for the SIM status, identities, versions and group identifiers one by one, and stores what changed.
void lookup_baseband_info_old(DataArk* ark) noexcept;

/// The radio info as a mutable dictionary without its status and error-reason entries, and the radio's status in
/// `status` unless that is null. None, with `status` left alone, after logging why when the radio reports no status or
/// an error.
[[nodiscard]] PropertyValue copyPostponementStuff(PropertyValue* status) noexcept;

/// Given to every telephony server connection. Nothing is expected to arrive here; an arrival is logged.
void _telvaneserver_callback(void* context) noexcept;

}  // namespace quorvel
