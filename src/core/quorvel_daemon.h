// The daemon object: the IPC listener's delegate, and the object that every connection exports.
#pragma once

#include <atomic>

#include "platform/ipc.h"
#include "store/data_ark.h"

namespace quorvel {

class QuorvelDaemon {
 public:
  constexpr QuorvelDaemon() noexcept = default;

  /// The data ark, borrowed; null until start-up has set it, once, before the first connection. Any thread.
  [[nodiscard]] DataArk* dark() const noexcept { return dark_.load(); }
  void set_dark(DataArk* ark) noexcept { dark_.store(ark); }

  /// Accepts every connection; `object` is the daemon object. On the IPC service's threads.
  static bool accept(void* object, platform::IpcListener* listener, platform::IpcConnection* connection) noexcept;

  /// Answers with the regulatory images dictionary, or none, and never an error. The file is read anew for each call,
  /// also for one that wants no reply. Any thread.
  void copyRegulatoryImagesWithCompletionBlock(platform::IpcReply& reply) const noexcept;

 private:
  std::atomic<DataArk*> dark_{nullptr};
};

}  // namespace quorvel
