#include "platform/notification_center.h"

#include <cstdlib>
#include <new>

#include "linux/base/error_line.h"
#include "linux/notifications/notification_server.h"
#include "wire/service_path.h"

namespace quorvel::platform {

namespace host {

NotificationServer& notification_server() noexcept {
  // Never destroyed: other threads may post until the process is gone.
  alignas(NotificationServer) static unsigned char storage[sizeof(NotificationServer)];
  static auto* const server = ::new (storage) NotificationServer;
  return *server;
}

void start_notification_server() noexcept {
  if (notification_server().start()) {
    std::atexit([] { notification_server().stop(); });
  } else {
    print_system_error("nobody can observe notifications, because %s/%s cannot be served",
                       wire::kServiceDirectory.data(), wire::kNotificationSocket.data());
  }
}

}  // namespace host

void post_notification(const PropertyValue& name, const PropertyValue& object) noexcept {
  host::NotificationServer& server = host::notification_server();
  if (!server.is_running()) return;
  ByteBuffer frame;
  // What cannot be encoded is passed on as missed.
  if (!wire::append_frame(wire::FrameKind::notification, 0, 0, name.text(), object, frame)) frame = ByteBuffer();
  server.post(std::move(frame));
}

}  // namespace quorvel::platform
