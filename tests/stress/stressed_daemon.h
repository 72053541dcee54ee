// A daemon in a scratch root, to be mistreated.
#pragma once

#include "quorvel/client.h"
#include "support/figures.h"
#include "support/program.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::test {

/// Of process `pid`: memory now, that of it which is not the pages of files, and the most since the last `forget_peak`,
/// in KiB; processor time used.
[[nodiscard]] long resident_kib(pid_t pid);
[[nodiscard]] long own_kib(pid_t pid);
[[nodiscard]] long peak_resident_kib(pid_t pid);
void forget_peak(pid_t pid);
[[nodiscard]] std::chrono::nanoseconds processor_time(pid_t pid);

/// In milliseconds.
struct Latencies {
  double p50 = 0;
  double p99 = 0;
  double worst = 0;
};
[[nodiscard]] Latencies latencies_of(std::vector<double> samples);
[[nodiscard]] std::string written(const Latencies& latencies);
[[nodiscard]] std::string written(double number, std::string_view unit);

/// The bytes of a call of the daemon's operation.
[[nodiscard]] std::string image_call(std::uint64_t serial);

/// Connected to the daemon; empty when it takes nobody at this moment.
[[nodiscard]] SocketPeer connected_now();
/// The same, waiting for a while until it does; throws when it does not.
[[nodiscard]] SocketPeer connected();

class StressedDaemon : public testing::Test {
 protected:
  StressedDaemon();

  /// Starts the daemon, with room for so many descriptors where a number is given.
  void start(int descriptor_limit = 0);
  /// SIGTERM must end it with status 0 within a second.
  void expect_quick_end(std::string_view stage);
  /// How many descriptors the daemon has open once nothing is under way.
  [[nodiscard]] std::size_t settled_descriptors() const;
  [[nodiscard]] pid_t pid() const { return daemon_->pid(); }

  /// Provisions regulatory images of this size: whole or absent at every instant.
  void provision_images(std::size_t size);
  void remove_images();

  /// One call of a well-behaved client over a connection of its own, in milliseconds; it must be answered.
  [[nodiscard]] double well_behaved_call() const;

  ScratchRoot root;

 private:
  std::unique_ptr<Program> daemon_;
  std::size_t image_size_ = 0;
};

}  // namespace quorvel::test
