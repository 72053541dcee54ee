// A message bus with a modem service on it that says whatever a test wants, however wrong.
#pragma once

#include <systemd/sd-bus.h>

#include <mutex>

#include "platform/descriptor.h"
#include "support/prelude.h"

namespace quorvel::test {

/// Puts something into a message.
using Append = std::function<int(sd_bus_message*)>;

/// Values as sd_bus_message_append takes them, alone and in a variant.
template <typename... Values>
Append body(const char* types, Values... values) {
  return [=](sd_bus_message* message) { return sd_bus_message_append(message, types, values...); };
}
template <typename... Values>
Append variant(const char* type, Values... values) {
  return body("v", type, values...);
}

using Properties = std::map<std::string, Append>;
/// Puts a{sv} into a message.
[[nodiscard]] Append dictionary_of(Properties properties);
/// Puts a{oa{sa{sv}}} into a message: modems by their object paths.
[[nodiscard]] Append modems_of(std::map<std::string, Properties> modems);

class FakeBus {
 public:
  /// Listens on the socket `path`, and has programs find it as the system bus.
  explicit FakeBus(const std::string& path);
  ~FakeBus();
  FakeBus(const FakeBus&) = delete;
  FakeBus& operator=(const FakeBus&) = delete;

  /// What `method` answers from now on; nothing: it never does. `method` is a member's name, or for GetAll the object's
  /// path. A reply may send signals, which go out before it.
  void answer(const std::string& method, Append reply);
  void fail(const std::string& method, const std::string& error);
  void send_signal(const std::string& path, const std::string& interface, const std::string& member,
                   const Append& body);
  /// How often `method` was called.
  [[nodiscard]] int calls(const std::string& method);

  /// Bytes that are no message, to everybody.
  void send_bytes(std::string_view bytes);
  void disconnect();
  /// From the next connection on: takes it and says nothing.
  void fall_silent(bool silent);

 private:
  struct Unref {
    void operator()(sd_bus* bus) const { sd_bus_flush_close_unref(bus); }
  };
  struct Connection {
    std::unique_ptr<sd_bus, Unref> bus;
    bool has_joined = false;  // said Hello, before which a bus tells nobody anything
  };

  static int on_message(sd_bus_message* message, void* self, sd_bus_error* error);
  void run();
  void take_connection();

  Descriptor listener_;
  Descriptor ending_;
  std::recursive_mutex mutex_;
  std::map<std::string, Append> answers_;
  std::map<std::string, std::string> errors_;
  std::map<std::string, int> calls_;
  std::vector<Connection> connections_;
  std::vector<Descriptor> silent_connections_;
  bool is_silent_ = false;
  std::thread thread_;
};

}  // namespace quorvel::test
