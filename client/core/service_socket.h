// Reaches a service's socket inside a device root, without waiting for it.
#pragma once

#include <string_view>

#include "client/core/failure.h"
#include "client/core/wait.h"
#include "platform/descriptor.h"

namespace quorvel::client {

class ServiceSocket {
 public:
  enum class Step { connected, busy, failed };

  /// Gets ready to connect to the service in the device root at `root`, an absolute path. Null: the one that
  /// QUORVEL_ROOT names, else "/". False after setting `failure`.
  [[nodiscard]] bool open(const char* root, std::string_view service, Failure& failure) noexcept;

  /// Tries to connect. `busy`: the service is there but takes no more connections just now, try again in a while;
  /// `failed` sets `failure`.
  [[nodiscard]] Step connect(Failure& failure) noexcept;

  /// The connection, which does not block.
  [[nodiscard]] int descriptor() const noexcept { return socket_.get(); }
  /// The path of the service's socket in the device root.
  [[nodiscard]] const char* path() const noexcept { return path_; }

 private:
  // No service can listen under a longer path: its socket address would not hold it.
  static constexpr std::size_t kPathSize = 108;

  [[nodiscard]] bool open_root(const char* root, Failure& failure) noexcept;
  [[nodiscard]] Descriptor open_in_root() const noexcept;
  [[nodiscard]] int connect_in_root() const noexcept;

  Descriptor root_;          // until the connection stands
  bool is_machine_ = false;  // whether the root is the machine's own
  Descriptor socket_;
  char path_[kPathSize] = {};
};

}  // namespace quorvel::client
