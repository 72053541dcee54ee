#include "bench/processes/local_socket.h"

#include <sys/socket.h>
#include <sys/un.h>

#include <chrono>
#include <stdexcept>
#include <thread>

namespace quorvel::bench {
namespace {

sockaddr_un address_of(const std::filesystem::path& path) {
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  path.native().copy(address.sun_path, sizeof address.sun_path - 1);
  return address;
}

}  // namespace

Descriptor listen_on(const std::filesystem::path& path) {
  const sockaddr_un address = address_of(path);
  Descriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (::bind(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) != 0 ||
      ::listen(socket.get(), SOMAXCONN) != 0) {
    throw std::runtime_error("cannot listen on " + path.string());
  }
  return socket;
}

Descriptor connect_to(const std::filesystem::path& path) {
  const sockaddr_un address = address_of(path);
  for (int attempt = 0; attempt < 200; ++attempt) {
    Descriptor socket(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    if (::connect(socket.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0) return socket;
    std::this_thread::sleep_for(std::chrono::milliseconds(10));
  }
  throw std::runtime_error("cannot connect to " + path.string());
}

}  // namespace quorvel::bench
