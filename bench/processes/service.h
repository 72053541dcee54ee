// What the load generator has to know of a service. The generator itself only sends and receives bytes that were made
// beforehand, so that its own cost is the same for all.
#pragma once

#include <cstddef>
#include <filesystem>
#include <memory>
#include <span>
#include <string>
#include <vector>

#include "bench/data_set.h"

namespace quorvel::bench {

class Service {
 public:
  virtual ~Service() = default;

  [[nodiscard]] virtual std::string name() const = 0;
  /// Puts the data where the service reads it for every call.
  virtual void provide(const DataSet& data) = 0;
  [[nodiscard]] virtual std::filesystem::path socket() const = 0;
  /// What is sent once on a new connection, and how many lines come back before the first request may be sent.
  [[nodiscard]] virtual std::string greeting() const { return {}; }
  [[nodiscard]] virtual std::size_t greeting_lines() const { return 0; }
  [[nodiscard]] virtual std::string request() const = 0;
  /// The whole length of a reply, told from its first `kReplyHead` bytes, and that of the part that carries the data,
  /// which stands at its end.
  static constexpr std::size_t kReplyHead = 16;
  [[nodiscard]] virtual std::size_t reply_length(std::span<const std::byte> head) const = 0;
  [[nodiscard]] virtual bool holds(std::span<const std::byte> reply, const DataSet& data) const = 0;
};

/// Those whose programs were built.
[[nodiscard]] std::vector<std::unique_ptr<Service>> make_services();

}  // namespace quorvel::bench
