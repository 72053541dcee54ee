#include "client_failure.h"

namespace quorvel::tools {

Failure unreachable(const client::Error& error, const std::string& service, const std::string& program) {
  std::string message = service + ": " + error.description;
  switch (error.code) {
    case client::ErrorCode::service_absent:
      message += ". Start " + program + " with the same device root (--root, QUORVEL_ROOT), then try again";
      break;
    case client::ErrorCode::access_denied:
      message += ". Run as the user that " + program + " runs as, or with sudo";
      break;
    case client::ErrorCode::timed_out:
    case client::ErrorCode::disconnected: message += " Look at what it does with: quorvelctl log"; break;
    case client::ErrorCode::protocol_error:
      message += " Check that " + program + " and quorvelctl are of the same version";
      break;
    default: break;
  }
  return {kUnreachable, std::move(message)};
}

}  // namespace quorvel::tools
