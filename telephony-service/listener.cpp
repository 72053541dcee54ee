#include "telephony-service/listener.h"

#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <system_error>

#include "linux/process/service_manager.h"
#include "platform/file_system.h"
#include "wire/service_path.h"

namespace quorvel::telephony {
namespace {

using platform::host::ListeningSocket;

constexpr int kBacklog = 256;

[[noreturn]] void fail(const std::string& what) { throw std::system_error(errno, std::generic_category(), what); }

}  // namespace

std::string socket_path() { return std::string(wire::kServiceDirectory) + '/' + std::string(wire::kTelephonySocket); }

ListeningSocket open_listener() {
  if (Descriptor passed = platform::host::take_passed_socket()) {
    // Whoever connects is shown who listened last: from now on this service, no more the service manager.
    if (::listen(passed.get(), kBacklog) != 0) fail(socket_path());
    return ListeningSocket(std::move(passed));
  }
  for (const char* directory : {"/run", wire::kServiceDirectory.data()}) {
    if (platform::make_directory(directory, 0755) != 0 && errno != EEXIST) fail(directory);
  }
  ListeningSocket listener = ListeningSocket::open(wire::kTelephonySocket, 0600);
  if (!listener) fail(socket_path());
  return listener;
}

bool is_trusted(int connection) noexcept {
  ucred peer{};
  socklen_t size = sizeof peer;
  if (::getsockopt(connection, SOL_SOCKET, SO_PEERCRED, &peer, &size) != 0) return false;
  if (peer.uid == 0 || peer.uid == ::geteuid()) return true;
  struct stat status {};
  const Descriptor directory = platform::host::open_service_directory();
  return directory && ::fstat(directory.get(), &status) == 0 && peer.uid == status.st_uid;
}

}  // namespace quorvel::telephony
