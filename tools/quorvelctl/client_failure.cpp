#include "client_failure.h"

#include "files.h"

namespace quorvel::tools {

Failure unreachable(const client::Error& error, const std::string& service, const std::string& program) {
  std::string message = service + ": " + error.description;
  switch (error.code) {
    case client::ErrorCode::service_absent: message += ". " + how_to_start(program); break;
    case client::ErrorCode::access_denied:
      message += ". Try again as the user that " + program + " runs as, or with sudo";
      break;
    case client::ErrorCode::timed_out:
    case client::ErrorCode::disconnected:
      message += std::string(" Look at what it does with: quorvelctl ") + (program == "quorveld" ? "log" : "status");
      break;
    case client::ErrorCode::protocol_error:
      message += " Check that " + program + " and quorvelctl are of the same version";
      break;
    default: break;
  }
  return {kUnreachable, std::move(message)};
}

}  // namespace quorvel::tools
