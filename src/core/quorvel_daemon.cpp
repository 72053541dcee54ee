#include "core/quorvel_daemon.h"

#include <cstdio>
#include <cstring>
#include <utility>

#include "files/property_list_file.h"
#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "protocol/quorvel_protocol.h"

namespace quorvel {
namespace {

PropertyValue copy_regulatory_images() noexcept {
  char path[1024 + 1];
  mobile_home_path(path);
  const std::size_t home = std::strlen(path);
  std::snprintf(path + home, sizeof path - home, "%s/%s", "/Library/qvd/regulatory_images", "regulatory_images.plist");
  PropertyValue images = load_dict(path);
  if (images && !images.is_dictionary()) {
    daemon_log(0, protocol::kCopyRegulatoryImages.data(), "%s does not hold a dictionary", path);
    images = nullptr;
  }
  return images;
}

// The shape of a call is settled here, so that the operation itself has no error to send.
void invoke_copy_regulatory_images(void* object, const PropertyValue& argument, platform::IpcReply reply) noexcept {
  if (argument) {
    const platform::IpcError error{protocol::kUnexpectedArgument, "the operation takes no argument"};
    if (reply) reply.send(nullptr, &error);
    return;
  }
  static_cast<const QuorvelDaemon*>(object)->copyRegulatoryImagesWithCompletionBlock(std::move(reply));
}

constexpr platform::IpcOperation kOperations[] = {{protocol::kCopyRegulatoryImages, invoke_copy_regulatory_images}};
constexpr platform::IpcInterface kInterface = {protocol::kInterfaceName, kOperations};

}  // namespace

bool QuorvelDaemon::accept(void* object, platform::IpcListener*, platform::IpcConnection* connection) noexcept {
  platform::set_exported_interface(connection, &kInterface);
  platform::set_exported_object(connection, object);
  platform::resume(connection);
  return true;
}

void QuorvelDaemon::copyRegulatoryImagesWithCompletionBlock(platform::IpcReply reply) const noexcept {
  const PropertyValue images = copy_regulatory_images();
  if (reply) reply.send(images, nullptr);
}

}  // namespace quorvel
