// The one description of the daemon's client interface that the daemon and its clients share.
//
// A call names an operation and carries no argument. Its reply carries a dictionary or none, and an error or none; the
// one error is that of a call which does carry an argument.
#pragma once

#include <string_view>

namespace quorvel::protocol {

inline constexpr std::string_view kServiceName = "com.Orvane.quorveld";
inline constexpr std::string_view kInterfaceName = "QuorvelProtocol";

/// The regulatory images that are provisioned on the device: a dictionary, or none when there are none.
inline constexpr std::string_view kCopyRegulatoryImages = "copyRegulatoryImagesWithCompletionBlock:";

}  // namespace quorvel::protocol
