#include "core/quorvel_daemon.h"

#include "files/property_list_file.h"
#include "log/client_lines.h"
#include "log/daemon_log.h"
#include "platform/device_paths.h"
#include "protocol/quorvel_protocol.h"

namespace quorvel {
namespace {

// Most files are passed on as their bytes; of any other, the value is returned.
PropertyValue copy_regulatory_images(CheckedBytes& bytes) noexcept {
  PropertyValue images = load_dict_or_bytes(paths::kRegulatoryImages, bytes);
  if (images && !images.is_dictionary()) {
    daemon_log(0, protocol::kCopyRegulatoryImages.data(), "%s does not hold a dictionary", paths::kRegulatoryImages);
    images = nullptr;
  }
  return images;
}

// The shape of a call is settled here, so that the operation itself has no error to send.
void invoke_copy_regulatory_images(void* object, const platform::IpcCall& call, platform::IpcReply& reply) noexcept {
  if (call.argument) {
    const platform::IpcError error{platform::kRefusedArgument, "the operation takes no argument"};
    if (reply) reply.send(nullptr, &error);
    return;
  }
  const ClientLines lines(call.caller.user, call.caller.process);
  static_cast<const QuorvelDaemon*>(object)->copyRegulatoryImagesWithCompletionBlock(reply);
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

void QuorvelDaemon::copyRegulatoryImagesWithCompletionBlock(platform::IpcReply& reply) const noexcept {
  CheckedBytes bytes;
  const PropertyValue images = copy_regulatory_images(bytes);
  if (!reply) return;
  if (bytes) {
    reply.send(bytes);
  } else {
    reply.send(images, nullptr);
  }
}

}  // namespace quorvel
