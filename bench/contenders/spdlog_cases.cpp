// spdlog with a rotating file of the same size and the same head of a line, flushed each line.
#include <spdlog/sinks/rotating_file_sink.h>
#include <spdlog/spdlog.h>

#include <memory>

#include "bench/cases/log_cases.h"
#include "bench/support/scratch_root.h"

namespace quorvel::bench {
namespace {

class SpdLog {
 public:
  SpdLog() : log_("bench", std::make_shared<spdlog::sinks::rotating_file_sink_mt>(files()[1].string(), 1'048'576, 1)) {
    log_.set_pattern("%a %b %e %H:%M:%S %Y pid=%P (%t) %v");
    log_.flush_on(spdlog::level::trace);
  }

  void write(unsigned number, unsigned thread) {
    log_.info("{}: dirtied by changing {}: {} line {}", "data_ark_set", "com.Orvane.mobile.domain123-Key45", thread,
              number);
  }
  [[nodiscard]] static std::vector<std::filesystem::path> files() {
    return {scratch_root().outside() / "spdlog.1.log", scratch_root().outside() / "spdlog.log"};
  }

 private:
  spdlog::logger log_;
};

[[maybe_unused]] const bool registered = register_log<SpdLog>("spdlog");

}  // namespace
}  // namespace quorvel::bench
