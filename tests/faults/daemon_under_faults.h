// A daemon with the preloaded library in it, and what must hold after anything was done to it.
#pragma once

#include "faults/shim/plan.h"
#include "quorvel/client.h"
#include "support/figures.h"
#include "support/program.h"
#include "support/scratch_root.h"

namespace quorvel::test {

/// One device root for many daemons, one after the other. Its data ark holds an entry that no save keeps, so that the
/// file before a start and the one after its save differ.
class DaemonUnderFaults {
 public:
  DaemonUnderFaults();

  /// What `prepare` is to take as the data file, in place of one that can be loaded.
  void use_data(std::string_view content) { old_data_ = content; }
  /// Puts the old data file in place and clears the plan, which is not armed.
  faults::Plan& prepare();
  void start();
  void start_without_library();
  /// Waits until the daemon has ended by itself.
  [[nodiscard]] bool has_ended(std::chrono::milliseconds patience);
  [[nodiscard]] Program& program() { return *program_; }
  void kill() { program_.reset(); }
  [[nodiscard]] const faults::Plan& plan() const { return *plan_; }
  void arm() { plan_->armed = true; }
  void disarm() { plan_->armed = false; }
  /// The calls that were counted, in order.
  [[nodiscard]] std::vector<faults::Call> trace() const;

  /// Each tells what is wrong, or nothing.
  [[nodiscard]] std::string store_fault() const;  ///< the data file is neither wholly the old nor wholly the new one
  [[nodiscard]] std::string service_fault();      ///< a client is not answered, or the log does not go on
  [[nodiscard]] std::string descriptor_fault(std::size_t allowed) const;
  [[nodiscard]] std::string ending_fault();  ///< SIGTERM does not end the daemon as it should
  [[nodiscard]] bool holds_new_data() const { return data() == new_data_; }

  [[nodiscard]] client::Reply call(std::chrono::milliseconds timeout) const;
  /// What a client is answered with while the file below is in place.
  void provision_images();
  /// The next call logs a line that ends like this, unlike those of the calls before, and so is not left out as a
  /// repeated one.
  std::string provision_no_images();

  ScratchRoot root;

 private:
  [[nodiscard]] std::string log_of(const std::string& path) const;
  [[nodiscard]] std::string data() const;

  std::string plan_path_;
  faults::Plan* plan_;
  std::string old_data_;
  std::string new_data_;
  std::unique_ptr<Program> program_;
  mode_t modes_ = 0;
};

}  // namespace quorvel::test
