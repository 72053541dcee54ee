// The client of the services of a device: calls an operation and hands out its reply.
//
//   quorvel::client::Client client;
//   quorvel::client::Reply reply = client.copy_regulatory_images();
//   if (reply.error) std::cerr << reply.error->description << '\n';
//
// Nothing here throws but std::bad_alloc. A client may be used from several threads at once.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <thread>

#include "client/core/error_code.h"
#include "property/value.h"

namespace quorvel::client {

struct Error {
  ErrorCode code;
  std::int32_t service_code = 0;
  std::string description;  // one sentence for a person
};

/// What a call came to: a value or none, and an error or none.
struct Reply {
  PropertyValue value;
  std::optional<Error> error;
};

struct Options {
  /// Absolute path of the directory that stands for the device's "/". Empty: what QUORVEL_ROOT names, else "/".
  std::string root = {};
  /// The service to call. Empty: the daemon.
  std::string service = {};
  /// For the whole call, from connecting to the last byte of the reply.
  std::chrono::milliseconds timeout{10'000};
  /// Largest reply that is taken, in bytes. Memory grows with the bytes that arrive, not with what a reply announces.
  std::uint32_t maximum_reply = 1u << 30;
};

/// A call under way. Its end waits for the completion to return, unless the completion itself ends it.
class PendingCall {
 public:
  PendingCall() noexcept = default;
  explicit PendingCall(std::thread thread) noexcept : thread_(std::move(thread)) {}
  PendingCall(PendingCall&&) noexcept = default;
  PendingCall& operator=(PendingCall&& other) noexcept {
    wait();
    thread_ = std::move(other.thread_);
    return *this;
  }
  ~PendingCall() { wait(); }
  /// Returns once the completion has returned.
  void wait() noexcept;

 private:
  std::thread thread_;
};

class Client {
 public:
  explicit Client(Options options = {}) : options_(std::move(options)) {}

  /// Calls `operation` with `argument` (none: no argument) over a connection of its own and waits for the reply.
  [[nodiscard]] Reply call(std::string_view operation, const PropertyValue& argument = {}) const;

  using Completion = std::function<void(Reply)>;
  /// The same without waiting: `completion` is called exactly once, on a thread of the call's own, or on the calling
  /// thread before the return when no thread can be had. It must not throw. The client may end before the call does.
  [[nodiscard]] PendingCall call(std::string_view operation, const PropertyValue& argument,
                                 Completion completion) const;

  /// The regulatory images provisioned on the device: a dictionary, or no value when there are none.
  [[nodiscard]] Reply copy_regulatory_images() const;
  [[nodiscard]] PendingCall copy_regulatory_images(Completion completion) const;

 private:
  Options options_;
};

}  // namespace quorvel::client
