// Sockets in the service directory. They are addressed through the directory's descriptor, so that a device root of any
// length fits a socket address.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <string_view>
#include <utility>

#include "linux/base/attached_descriptors.h"
#include "platform/descriptor.h"

namespace quorvel::platform::host {

/// The service directory inside the device root, for addressing what lies in it; empty with errno set.
[[nodiscard]] Descriptor open_service_directory() noexcept;

/// A connection, not blocking, to the socket `name` in the service directory; empty with errno set. Never waits: a
/// listener whose queue is full gives EAGAIN.
[[nodiscard]] Descriptor connect_local(std::string_view name) noexcept;

/// True when somebody listens on the socket `name` in the service directory.
[[nodiscard]] bool is_served(std::string_view name) noexcept;

/// A listening socket that takes no attached descriptors (attached_descriptors.h). One that made its own file takes the
/// file away when it ends, unless another file has its name by then.
class ListeningSocket {
 public:
  ListeningSocket() noexcept = default;
  /// Takes over a listening socket from elsewhere; its file stays.
  explicit ListeningSocket(Descriptor socket) noexcept : socket_(std::move(socket)) {
    refuse_further_descriptors(socket_.get());
  }
  ListeningSocket(ListeningSocket&& other) noexcept { *this = std::move(other); }
  ListeningSocket& operator=(ListeningSocket&& other) noexcept;
  ~ListeningSocket() {
    remove_file();
    close_connection(std::move(socket_));
  }

  /// Listens on `name` in the service directory. The file has `mode` and the directory's owner, as far as this process
  /// may give it away, before anybody can connect; one that was left behind by a dead process is replaced. Empty with
  /// errno set: EADDRINUSE when a live process holds it, EEXIST when something other than a socket stands there.
  [[nodiscard]] static ListeningSocket open(std::string_view name, mode_t mode = 0666) noexcept;

  [[nodiscard]] explicit operator bool() const noexcept { return static_cast<bool>(socket_); }
  [[nodiscard]] int get() const noexcept { return socket_.get(); }
  /// Takes the file away now, so that nobody new connects.
  void remove_file() noexcept;

 private:
  static constexpr std::size_t kNameSize = 108;

  [[nodiscard]] bool bind_and_listen(std::string_view name, mode_t mode) noexcept;

  Descriptor socket_;
  Descriptor directory_;
  char name_[kNameSize] = {};  // empty when there is no file to take away
  dev_t device_ = 0;
  ino_t inode_ = 0;
};

}  // namespace quorvel::platform::host
