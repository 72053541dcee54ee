// Why a call or an observer came to nothing.
#pragma once

namespace quorvel::client {

enum class ErrorCode {
  invalid_root = 1,  // the device root is no absolute path of a directory
  service_absent,    // nobody serves the socket: start the service, or look into another device root
  access_denied,     // the socket is there, but its mode or owner keeps the caller out
  invalid_argument,  // the operation's name or argument cannot be sent
  timed_out,         // the whole reply was not there in time
  disconnected,      // the service ended the connection first
  protocol_error,    // what arrived is not of the protocol, or is larger than the limit
  service_failure,   // the service answered with an error of its own: see `service_code`
  system_failure,    // the machine refused a descriptor, memory or a thread
};

}  // namespace quorvel::client
