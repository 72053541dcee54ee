#include "bridge/fake_bus.h"

#include <poll.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <sys/un.h>

namespace quorvel::test {

Append dictionary_of(Properties properties) {
  return [properties = std::move(properties)](sd_bus_message* message) {
    int result = sd_bus_message_open_container(message, 'a', "{sv}");
    for (const auto& [name, value] : properties) {
      if (result >= 0) result = sd_bus_message_open_container(message, 'e', "sv");
      if (result >= 0) result = sd_bus_message_append(message, "s", name.c_str());
      if (result >= 0) result = value(message);
      if (result >= 0) result = sd_bus_message_close_container(message);
    }
    return result < 0 ? result : sd_bus_message_close_container(message);
  };
}

Append modems_of(std::map<std::string, Properties> modems) {
  return [modems = std::move(modems)](sd_bus_message* message) {
    int result = sd_bus_message_open_container(message, 'a', "{oa{sa{sv}}}");
    for (const auto& [path, properties] : modems) {
      if (result >= 0) result = sd_bus_message_open_container(message, 'e', "oa{sa{sv}}");
      if (result >= 0) result = sd_bus_message_append(message, "o", path.c_str());
      if (result >= 0) result = sd_bus_message_open_container(message, 'a', "{sa{sv}}");
      if (result >= 0) result = sd_bus_message_open_container(message, 'e', "sa{sv}");
      if (result >= 0) result = sd_bus_message_append(message, "s", "org.freedesktop.ModemManager1.Modem");
      if (result >= 0) result = dictionary_of(properties)(message);
      for (int container = 0; container < 3 && result >= 0; ++container) {
        result = sd_bus_message_close_container(message);
      }
    }
    return result < 0 ? result : sd_bus_message_close_container(message);
  };
}

FakeBus::FakeBus(const std::string& path)
    : listener_(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)), ending_(::eventfd(0, EFD_CLOEXEC)) {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  path.copy(address.sun_path, sizeof address.sun_path - 1);
  if (::bind(listener_.get(), reinterpret_cast<sockaddr*>(&address), sizeof address) != 0 ||
      ::listen(listener_.get(), 4) != 0) {
    throw std::runtime_error("no socket for the bus");
  }
  ::setenv("DBUS_SYSTEM_BUS_ADDRESS", ("unix:path=" + path).c_str(), 1);
  answers_["Hello"] = body("s", ":1.7");
  answers_["AddMatch"] = body("");
  thread_ = std::thread([this] { run(); });
}

FakeBus::~FakeBus() {
  const std::uint64_t one = 1;
  static_cast<void>(!::write(ending_.get(), &one, sizeof one));
  thread_.join();
}

void FakeBus::answer(const std::string& method, Append reply) {
  const std::lock_guard hold(mutex_);
  errors_.erase(method);
  answers_[method] = std::move(reply);
}

void FakeBus::fail(const std::string& method, const std::string& error) {
  const std::lock_guard hold(mutex_);
  errors_[method] = error;
}

void FakeBus::send_signal(const std::string& path, const std::string& interface, const std::string& member,
                          const Append& body) {
  const std::lock_guard hold(mutex_);
  for (const Connection& connection : connections_) {
    if (!connection.has_joined) continue;
    sd_bus* const to = connection.bus.get();
    sd_bus_message* signal = nullptr;
    int result = sd_bus_message_new_signal(to, &signal, path.c_str(), interface.c_str(), member.c_str());
    if (result >= 0) result = sd_bus_message_set_sender(signal, ":1.3");
    if (result >= 0) result = body(signal);
    EXPECT_GE(result, 0) << "the signal " << member << " cannot be made";
    // Whoever has left meanwhile reads everything when it is back.
    static_cast<void>(sd_bus_send(to, signal, nullptr));
    sd_bus_message_unref(signal);
  }
}

int FakeBus::calls(const std::string& method) {
  const std::lock_guard hold(mutex_);
  return calls_[method];
}

void FakeBus::send_bytes(std::string_view bytes) {
  const std::lock_guard hold(mutex_);
  for (const Connection& connection : connections_) {
    if (!connection.has_joined) continue;
    static_cast<void>(::send(sd_bus_get_fd(connection.bus.get()), bytes.data(), bytes.size(), MSG_NOSIGNAL));
  }
}

void FakeBus::disconnect() {
  const std::lock_guard hold(mutex_);
  connections_.clear();
  silent_connections_.clear();
}

void FakeBus::fall_silent(bool silent) {
  const std::lock_guard hold(mutex_);
  is_silent_ = silent;
}

int FakeBus::on_message(sd_bus_message* message, void* self, sd_bus_error*) {
  auto& bus = *static_cast<FakeBus*>(self);
  if (sd_bus_message_is_method_call(message, nullptr, nullptr) <= 0) return 0;
  std::string method = sd_bus_message_get_member(message);
  if (method == "GetAll") method = sd_bus_message_get_path(message);
  ++bus.calls_[method];
  if (method == "Hello") {
    for (Connection& connection : bus.connections_) {
      connection.has_joined |= connection.bus.get() == sd_bus_message_get_bus(message);
    }
  }
  if (const auto error = bus.errors_.find(method); error != bus.errors_.end()) {
    static_cast<void>(sd_bus_reply_method_errorf(message, error->second.c_str(), "it fails"));
    return 1;
  }
  const auto answer = bus.answers_.find(method);
  if (answer == bus.answers_.end() || !answer->second) return 1;
  sd_bus_message* reply = nullptr;
  int result = sd_bus_message_new_method_return(message, &reply);
  if (result >= 0) result = sd_bus_message_set_sender(reply, ":1.3");
  if (result >= 0) result = answer->second(reply);
  EXPECT_GE(result, 0) << "the answer to " << method << " cannot be made";
  static_cast<void>(sd_bus_send(nullptr, reply, nullptr));
  sd_bus_message_unref(reply);
  return 1;
}

void FakeBus::take_connection() {
  const int descriptor = ::accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC);
  if (is_silent_) {
    silent_connections_.emplace_back(descriptor);
    return;
  }
  sd_bus* bus = nullptr;
  sd_id128_t identity{};
  int result = sd_bus_new(&bus);
  if (result >= 0) result = sd_bus_set_fd(bus, descriptor, descriptor);
  if (result >= 0) result = sd_id128_randomize(&identity);
  if (result >= 0) result = sd_bus_set_server(bus, 1, identity);
  if (result >= 0) result = sd_bus_add_filter(bus, nullptr, on_message, this);
  if (result >= 0) result = sd_bus_start(bus);
  EXPECT_GE(result, 0) << "the bus cannot serve";
  connections_.emplace_back().bus.reset(bus);
}

void FakeBus::run() {
  for (;;) {
    std::vector<pollfd> waits = {{ending_.get(), POLLIN, 0}, {listener_.get(), POLLIN, 0}};
    {
      const std::lock_guard hold(mutex_);
      for (const Connection& connection : connections_) {
        waits.push_back({sd_bus_get_fd(connection.bus.get()), POLLIN, 0});
      }
    }
    // What a test queues meanwhile goes out with the next turn.
    ::poll(waits.data(), waits.size(), 20);
    if (waits[0].revents != 0) break;
    const std::lock_guard hold(mutex_);
    if (waits[1].revents != 0) take_connection();
    std::erase_if(connections_, [](const Connection& connection) {
      int result = 1;
      while ((result = sd_bus_process(connection.bus.get(), nullptr)) > 0) continue;
      return result < 0;
    });
  }
  connections_.clear();
}

}  // namespace quorvel::test
