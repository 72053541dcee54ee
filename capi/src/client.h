// The settings behind a client handle.
#pragma once

#include "client/core/call.h"
#include "handles.h"

/// A copied text that ends with itself.
class OwnedText {
 public:
  OwnedText() noexcept = default;
  OwnedText(const OwnedText&) = delete;
  OwnedText& operator=(const OwnedText&) = delete;
  ~OwnedText() { std::free(text_); }
  /// Null takes the text away. False, and no change, when memory runs out.
  [[nodiscard]] bool set(const char* text) noexcept;
  [[nodiscard]] const char* get() const noexcept { return text_; }

 private:
  char* text_ = nullptr;
};

struct quorvel_client {
  OwnedText root, service;
  std::int64_t time_limit = quorvel::client::Target{}.timeout;
  std::uint32_t maximum_reply = quorvel::client::Target{}.maximum_reply;

  [[nodiscard]] quorvel::client::Target target() const noexcept;
};
